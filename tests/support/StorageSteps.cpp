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

#include "daemon/http/Revocations.h"
#include "daemon/preferences/PreferencesStore.h"
#include "tests/support/StoredState.h"

namespace {

using support::StoredState;
using support::succeed;
using support::valueOf;

const std::string kType(RVAccountTypeIdentifierFacebook);
const std::string kApp = "org.example.App";
const std::string kAppId = "4711";

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

  void grant() { state.put(kApp, true, RVDictionary{{"app_id", kAppId}}); }
  void owe() { valueOf(state.outbox.owe(kType, kAppId, *state.accounts, *state.records)); }
  records::OwedRevocation owed() { return valueOf(state.outbox.list()).at(0); }

  std::string accountId() const { return state.accounts->list().at(0).identifier; }

  StoredState state;
  preferences::PreferencesStore preferences;
  std::string added;
  std::string account;
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
  text += ", " + std::to_string(valueOf(stores.state.accessLog.newest(100)).size()) + " decisions";
  for (const auto& owed : valueOf(stores.state.outbox.list())) text += ", owed " + owed.appId;
  return text;
}

// Has everything told that is owed, by a server that answers at once; returns what it was told.
std::string tell(Stores& stores) {
  std::string told;
  http::Revocations::Means means;
  means.tokenOf = [&](const std::string& account) {
    return base::Result<std::optional<RVSecret>>(
        valueOf(stores.state.credentialStore->read({account, std::nullopt})).value().oauthToken());
  };
  means.erase = [&](const std::string& account) { stores.state.keychain->eraseAccount(account); };
  means.send = [&](const std::string& appId, const auto& token, const auto& answered) {
    told += ", " + std::string(token->reveal()) + " forgets " + appId;
    answered("{}", TKHTTPResponse{200}, std::nullopt);
  };
  means.run = [](const auto& work) {
    work();
    return true;
  };
  http::Revocations revocations(valueOf(stores.state.outbox.list()),
                                {stores.state.outbox, *stores.state.accounts, *stores.state.records},
                                means,
                                stores.state.log);
  revocations.start();
  if (!valueOf(stores.state.outbox.list()).empty()) told += ", not all";
  if (!valueOf(stores.state.accounts->retired()).empty()) told += ", a retired account is left";
  return told;
}

struct Step {
  std::function<void(Stores&)> work;
  std::string after;  // what a start finds once it is done
};

const std::vector<Step>& steps() {
  using records::Intent;
  static const std::string kRevoked = "1 accounts, master, refused, 1 decisions, owed 4711";
  static const std::string kRemoved = "0 accounts, 1 decisions, owed 4711";
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
      {[](Stores& s) { s.grant(); }, "1 accounts, master, token one, granted, 0 decisions"},
      {[](Stores& s) { s.storeCredential("two"); }, "1 accounts, master, token two, granted, 0 decisions"},
      {[](Stores& s) { s.state.accessLog.RVDLogAccessRequest(kType, kApp, true, true, 0); },
       "1 accounts, master, token two, granted, 1 decisions"},
      {[](Stores& s) { succeed(s.preferences.set("app", "key", true)); },
       "1 accounts, master, token two, granted, preference, 1 decisions"},
      {[](Stores& s) { succeed(s.preferences.reset("app", "key")); },
       "1 accounts, master, token two, granted, 1 decisions"},
      // Once it is written down, the revocation holds, and the server is owed it.
      {[](Stores& s) {
         s.intent = valueOf(s.state.intents.begin({Intent::Kind::kRevokeClient, kType, kApp}));
       },
       kRevoked},
      {[](Stores& s) { s.owe(); }, kRevoked},
      {[](Stores& s) { (void)s.state.keychain->removeCredentialForAccount(*s.state.account(), kApp); },
       kRevoked},
      {[](Stores& s) {
         s.state.put(kApp, false, RVDictionary{{"app_id", kAppId}});
       },
       kRevoked},
      {[](Stores& s) { succeed(s.state.intents.finish(s.intent)); }, kRevoked},
      // The server has answered.
      {[](Stores& s) { succeed(s.state.outbox.remove(s.owed())); },
       "1 accounts, master, refused, 1 decisions"},
      {[](Stores& s) { s.grant(); }, "1 accounts, master, granted, 1 decisions"},
      {[](Stores& s) { s.storeCredential("three"); },
       "1 accounts, master, token three, granted, 1 decisions"},
      {[](Stores& s) {
         s.account = s.accountId();
         s.intent = valueOf(s.state.intents.begin({Intent::Kind::kRemoveAccount, kType, s.account}));
       },
       kRemoved},
      {[](Stores& s) { s.owe(); }, kRemoved},
      {[](Stores& s) { (void)s.state.keychain->removeCredentialForAccount(*s.state.account(), kApp); },
       kRemoved},
      {[](Stores& s) { succeed(s.state.records->removeAll(kType)); }, kRemoved},
      {[](Stores& s) { succeed(s.state.accounts->retire(s.account)); }, kRemoved},
      {[](Stores& s) { succeed(s.state.intents.finish(s.intent)); }, kRemoved},
      {[](Stores& s) { succeed(s.state.outbox.remove(s.owed())); }, "0 accounts, 1 decisions"},
      {[](Stores& s) { succeed(s.state.accounts->remove(s.account)); }, "0 accounts, 1 decisions"},
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

// Also whether the server is told of everything that is owed, in the name of the account that owes it.
int check(const std::string& path, std::size_t done) {
  static const std::string kOwed = ", owed 4711";
  for (int start = 0; start < 2; ++start) {  // what the first start has mended, the second finds in order
    Stores stores(path);
    const std::string found = describe(stores);
    std::string before = done == 0 ? steps().front().after : steps()[done - 1].after;
    std::string after = done < steps().size() ? steps()[done].after : before;
    if (start > 0) {
      // The server was told meanwhile.
      before = before.substr(0, before.find(kOwed));
      after = after.substr(0, after.find(kOwed));
    }
    if (found != before && found != after) {
      std::cerr << "after step " << done << " there is: " << found << "\nexpected: " << before
                << "\n      or: " << after << "\n";
      return 1;
    }
    const std::string told = tell(stores);
    if (told != (found.ends_with(kOwed) ? ", master forgets 4711" : "")) {
      std::cerr << "after step " << done << " the server was told" << told << "\n";
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
