// Does everything that is ever done to the stores, one step after the other, and checks what is left of it
// after it was killed.
//
//   storage_steps run DIRECTORY          writes the number of each step to standard output once it is done
//   storage_steps check DIRECTORY DONE   starts as the daemon does after DONE steps were seen to be done, and
//                                        exits with 1 where what it finds is neither that nor one step more
#include <unistd.h>

#include <exception>
#include <filesystem>
#include <functional>
#include <iostream>
#include <optional>
#include <string>
#include <vector>

#include "daemon/preferences/PreferencesStore.h"
#include "tests/support/StoredState.h"

namespace {

using support::StoredState;
using support::succeed;
using support::valueOf;

const std::string kType(RVAccountTypeIdentifierFacebook);
const std::string kApp = "org.example.App";

// What a start finds, and the intent that is open while the steps run.
struct Stores {
  explicit Stores(const std::string& path)
      : state(path),
        preferences(*state.directory, state.log) {
    state.reconcile();
  }

  void storeCredential(const std::string& token) {
    if (const auto error = state.storeCredential(kApp, token))
      throw std::runtime_error(error->localizedDescription().value_or("no credential stored"));
  }

  std::string accountId() const { return state.accounts->list().at(0).identifier; }

  StoredState state;
  preferences::PreferencesStore preferences;
  std::string added;
  std::int64_t intent = 0;
};

std::string describe(Stores& stores) {
  std::string text = std::to_string(stores.state.accounts->list().size()) + " accounts";
  if (!stores.state.accounts->list().empty()) {
    const auto account = stores.state.account();
    if (stores.state.keychain->credentialForAccount(*account, std::nullopt) != nullptr) text += ", master";
    if (const auto credential = stores.state.keychain->credentialForAccount(*account, kApp))
      text += ", token " + std::string(credential->oauthToken().reveal());
  }
  if (const auto record = stores.state.records->find(kType, kApp))
    text += record->granted ? ", granted" : ", refused";
  if (valueOf(stores.preferences.get("app", "key"))) text += ", preference";
  return text + ", " + std::to_string(valueOf(stores.state.accessLog.newest(100)).size()) + " decisions";
}

struct Step {
  std::function<void(Stores&)> work;
  std::string after;  // what a start finds once it is done
};

const std::vector<Step>& steps() {
  using records::Intent;
  static const std::vector<Step> kSteps = {
      {[](Stores&) {}, "0 accounts, 0 decisions"},
      // Of no use without its token.
      {[](Stores& s) { s.added = valueOf(s.state.accounts->add(kType, "me")).identifier; },
       "0 accounts, 0 decisions"},
      {[](Stores& s) { succeed(s.state.keychain->setMasterCredential(s.added, RVSecret("master"))); },
       "0 accounts, 0 decisions"},
      {[](Stores& s) { succeed(s.state.accounts->finishSetUp(s.added)); }, "1 accounts, master, 0 decisions"},
      {[](Stores& s) { s.state.put(kApp, false); }, "1 accounts, master, refused, 0 decisions"},
      {[](Stores& s) { succeed(s.state.records->forgetRefusal(kType, kApp)); },
       "1 accounts, master, 0 decisions"},
      // No grant stands for it yet.
      {[](Stores& s) { s.storeCredential("one"); }, "1 accounts, master, 0 decisions"},
      {[](Stores& s) { s.state.put(kApp, true); }, "1 accounts, master, token one, granted, 0 decisions"},
      {[](Stores& s) { s.storeCredential("two"); }, "1 accounts, master, token two, granted, 0 decisions"},
      {[](Stores& s) { s.state.accessLog.RVDLogAccessRequest(kType, kApp, true, true, 0); },
       "1 accounts, master, token two, granted, 1 decisions"},
      {[](Stores& s) { succeed(s.preferences.set("app", "key", true)); },
       "1 accounts, master, token two, granted, preference, 1 decisions"},
      {[](Stores& s) { succeed(s.preferences.reset("app", "key")); },
       "1 accounts, master, token two, granted, 1 decisions"},
      // Once it is written down, the revocation holds.
      {[](Stores& s) {
         s.intent = valueOf(s.state.intents.begin({Intent::Kind::kRevokeClient, kType, kApp}));
       },
       "1 accounts, master, refused, 1 decisions"},
      {[](Stores& s) { (void)s.state.keychain->removeCredentialForAccount(*s.state.account(), kApp); },
       "1 accounts, master, refused, 1 decisions"},
      {[](Stores& s) { s.state.put(kApp, false); }, "1 accounts, master, refused, 1 decisions"},
      {[](Stores& s) { succeed(s.state.intents.finish(s.intent)); },
       "1 accounts, master, refused, 1 decisions"},
      {[](Stores& s) {
         s.intent = valueOf(s.state.intents.begin({Intent::Kind::kRemoveAccount, kType, s.accountId()}));
       },
       "0 accounts, 1 decisions"},
      {[](Stores& s) { succeed(s.state.records->removeAll(kType)); }, "0 accounts, 1 decisions"},
      {[](Stores& s) { succeed(s.state.accounts->remove(s.accountId())); }, "0 accounts, 1 decisions"},
      {[](Stores& s) { succeed(s.state.intents.finish(s.intent)); }, "0 accounts, 1 decisions"},
  };
  return kSteps;
}

int run(const std::string& path) {
  Stores stores(path);
  for (std::size_t done = 0; done < steps().size();) {
    steps()[done].work(stores);
    const std::string line = std::to_string(++done) + "\n";
    if (::write(STDOUT_FILENO, line.data(), line.size()) < 0) return 1;
  }
  return 0;
}

int check(const std::string& path, std::size_t done) {
  for (int start = 0; start < 2; ++start) {  // what the first start has mended, the second finds in order
    Stores stores(path);
    const std::string found = describe(stores);
    const std::string before = done == 0 ? steps().front().after : steps()[done - 1].after;
    const std::string after = done < steps().size() ? steps()[done].after : before;
    if (found != before && found != after) {
      std::cerr << "after step " << done << " there is: " << found << "\nexpected: " << before
                << "\n      or: " << after << "\n";
      return 1;
    }
    for (const auto& line : stores.state.log.lines()) {
      if (line.level > kRVLogLevelError && start == 0) continue;
      std::cerr << "after step " << done << ", start " << start << ": " << line.text << "\n";
      return 1;
    }
  }
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  const std::vector<std::string> arguments(argv + 1, argv + argc);
  try {
    if (arguments.size() == 2 && arguments[0] == "run") return run(arguments[1]);
    if (arguments.size() == 3 && arguments[0] == "check")
      return check(arguments[1], std::stoul(arguments[2]));
  } catch (const std::exception& exception) {
    std::cerr << exception.what() << "\n";
    return 1;
  }
  std::cerr << "use: storage_steps run DIRECTORY | check DIRECTORY DONE\n";
  return 2;
}
