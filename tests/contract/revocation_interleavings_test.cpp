// Revocations among requests, direct grants and reads, in every order that chance makes of them.
#include <gtest/gtest.h>
#include <sodium.h>

#include <atomic>
#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <latch>
#include <random>
#include <set>
#include <thread>

#include "Facebook/FacebookAccessPlugin/TKFacebookAccountAccessPlugin.h"
#include "daemon/requests/RequestPool.h"
#include "daemon/requests/RequestTable.h"
#include "tests/fakes/FakeHost.h"
#include "tests/support/StoredState.h"

namespace {

using requests::Outcome;
using requests::RequestKey;
using requests::VoidReason;
using support::succeed;
using support::valueOf;

const std::string kType(RVAccountTypeIdentifierFacebook);
const std::vector<std::string> kClients = {"org.example.One", "org.example.Two"};

std::uint64_t numberFrom(const char* variable, std::uint64_t otherwise) {
  const char* text = std::getenv(variable);
  return text != nullptr ? std::strtoull(text, nullptr, 10) : otherwise;
}

// What happened when, by a clock that only counts.
struct Grant {
  std::size_t client = 0;
  std::uint64_t began = 0;      // before it was handed to the table
  std::uint64_t submitted = 0;  // after
};
struct Read {
  std::size_t client = 0;
  std::uint64_t began = 0;
  std::string token;  // empty: it gave no credential
};
struct Revocation {
  std::optional<std::size_t> client;  // absent: of all
  std::uint64_t began = 0;
  std::uint64_t returned = 0;
  std::size_t leftovers = 0;        // credentials of its clients that were stored when it returned
  std::vector<std::string> sealed;  // what had been stored when it began, as it stood in the file
};

// The services of the daemon around the plug-in, with a fake server and a user who allows everything.
class Interleavings : public ::testing::Test {
 protected:
  void SetUp() override {
    // What a power cut leaves is not looked at here, and thousands of transactions take their time.
    succeed(state_.database->read(
        [](records::Connection& connection) { return connection.execute("PRAGMA synchronous = OFF"); }));
    account_ = state_.addAccount();
    for (const std::string& id : kClients) clients_.push_back(support::StoredState::client(id));
  }

  RVDHostServices services() {
    RVDHostServices services = host_.services();
    services.keychainManager = state_.keychain.get();
    services.accessLog = &state_.accessLog;
    return services;
  }

  std::uint64_t tick() { return ++clock_; }

  // As AccountsService does for RequestAccess.
  void request(std::size_t client, const std::string& permission) {
    const RVDictionary options{{std::string(RVFacebookAppIdKey), "4711"},
                               {std::string(RVFacebookPermissionsKey), RVArray{permission}}};
    table_.submit(
        RequestKey::forOptions("id " + kClients[client], clients::Evidence::kRegistered, kType, options),
        caller(),
        nullptr,
        {},
        [this, client, options](const RVDAccessCompletion& completion) {
          plugin_.handleAccessRequestToAccountsOfType(type_,
                                                      clients_[client],
                                                      options,
                                                      state_.storeFor(requests::RequestContext::current()),
                                                      true,
                                                      completion);
        });
  }

  // As ManagementService does for AuthorizeAccess.
  void authorize(std::size_t client) {
    table_.submitAlone(
        {"id " + kClients[client], kType, {}, {}, {}, {}},
        caller(),
        nullptr,
        [this, client](const RVDAccessCompletion& completion) {
          plugin_.authorizeAccessToAccountsOfType(
              type_, clients_[client], state_.storeFor(requests::RequestContext::current()), completion);
        });
  }

  // As ManagementService does for RevokeAccess and RevokeAllAccess.
  void revoke(Revocation& revocation) {
    const auto affected = affectedBy(revocation);
    for (const std::size_t client : affected)
      if (auto sealed = sealedOf(client); !sealed.empty()) revocation.sealed.push_back(std::move(sealed));
    revocation.began = tick();
    {
      const auto barrier = table_.makeVoid(VoidReason::kClientRevoked, [&](const RequestKey& key) {
        return !revocation.client || key.clientKey == "id " + kClients[*revocation.client];
      });
      using Kind = records::Intent::Kind;
      const auto completion = [](bool, const std::optional<RVError>&) {};
      std::optional<std::string> id;
      if (revocation.client) id = kClients[*revocation.client];
      const auto intent = valueOf(
          state_.intents.begin({id ? Kind::kRevokeClient : Kind::kRevokeAll, kType, id.value_or("")}));
      if (id)
        plugin_.revokeAccessToAccountsOfType(
            type_, clients_[*revocation.client], state_.storeFor(nullptr), completion);
      else
        plugin_.revokeAllAccessToAccountsOfType(type_, state_.storeFor(nullptr), completion);
      succeed(state_.keychain->eraseClients(account_, id));
      succeed(state_.intents.finish(intent));
      for (const std::size_t client : affected)
        if (!sealedOf(client).empty()) ++revocation.leftovers;
    }
    revocation.returned = tick();
  }

  // As AccountsService does for GetCredential.
  std::string read(std::size_t client) {
    const auto record = state_.records->find(kType, kClients[client]);
    if (!record || !record->granted) return "";
    const auto credential =
        state_.keychain->credentialForClient(account_, kClients[client], clients::Evidence::kRegistered);
    return credential != nullptr ? std::string(credential->oauthToken().reveal()) : "";
  }

  std::vector<std::size_t> affectedBy(const Revocation& revocation) const {
    if (revocation.client) return {*revocation.client};
    return {0, 1};
  }

  std::string sealedOf(std::size_t client) {
    std::string bytes;
    succeed(state_.database->read([&](records::Connection& connection) -> base::Result<void> {
      auto statement = valueOf(connection.prepare("SELECT sealed FROM credentials WHERE client_id = ?1"));
      statement->bind(kClients[client]);
      if (valueOf(statement->step())) bytes = statement->blob(0);
      return {};
    }));
    return bytes;
  }

  // How many of these byte strings stand in the database's files.
  std::size_t countOnDisk(const std::vector<std::string>& secrets) {
    std::size_t found = 0;
    for (const auto& entry : std::filesystem::directory_iterator(path_)) {
      const std::string content = support::contentOf(entry.path());
      for (const std::string& secret : secrets) found += content.find(secret) != std::string::npos ? 1 : 0;
    }
    return found;
  }

  requests::RequestTable::Caller caller() {
    ++unanswered_;
    return {"", [this](const Outcome& outcome) {
              ++(outcome.kind == Outcome::Kind::kVoid ? voided_ : decided_);
              --unanswered_;
              unanswered_.notify_all();
            }};
  }
  void waitForAnswers() {
    for (int left = unanswered_; left > 0; left = unanswered_) unanswered_.wait(left);
    host_.facebookRequests.waitUntilDelivered();
  }

  void runOne(std::uint64_t seed);
  void check(const std::vector<Grant>& grants,
             const std::vector<Read>& reads,
             const Revocation& revocation,
             std::uint64_t seed);

  support::TemporaryDirectory temporary_;
  const std::string path_ = temporary_.path("rvd");
  support::StoredState state_{path_};
  std::string account_;
  std::vector<std::shared_ptr<const RVDClient>> clients_;
  const std::shared_ptr<const RVAccountType> type_ = std::make_shared<const RVAccountType>(kType);
  fakes::FakeHost host_;
  TKFacebookAccountAccessPlugin plugin_{services()};
  std::atomic<std::uint64_t> clock_ = 0;
  std::atomic<int> unanswered_ = 0;
  std::atomic<int> voided_ = 0;
  std::atomic<int> decided_ = 0;
  std::uint64_t tokens_ = 0;
  std::size_t readsAfterReturn_ = 0;
  std::size_t readsThatGave_ = 0;  // at any time
  std::size_t wrongReads_ = 0;     // after the return, before a new grant
  std::size_t wrongGrants_ = 0;    // by what began before
  std::size_t overtaken_ = 0;      // interleavings in which everything that grants began before
  std::size_t leftovers_ = 0;
  std::size_t onDisk_ = 0;
  requests::RequestPool pool_{8, 32, std::chrono::seconds(10)};
  requests::RequestTable table_{pool_,
                                {[](const std::string& reason) { ADD_FAILURE() << reason; },
                                 [this](const auto& request) {
                                   if (request->isVoid()) state_.keychain->requestEnded(request);
                                 }}};
};

void Interleavings::runOne(std::uint64_t seed) {
  // So that what is searched for secrets stays small: the log of the runs before is too old.
  state_.now += support::StoredState::kKeepAccessLog + std::chrono::days(1);
  host_.journal->clear();
  std::mt19937_64 random(seed);
  const auto below = [&](std::uint64_t limit) { return random() % limit; };
  static const std::vector<std::string> kPermissions = {
      "email", "user_photos", "user_likes", "publish_stream"};

  std::vector<fakes::FakeReply> replies;
  for (int i = 0; i < 6; ++i)
    replies.push_back(fakes::FakeReply::withBody(R"({"access_token":"a-token-of-)" + std::to_string(seed) +
                                                 "-" + std::to_string(i) + R"(","permissions":["email"]})"));
  host_.facebookRequests.replyToAuthorizations(replies);

  std::vector<Grant> grants(1 + below(4));
  Revocation revocation;
  if (below(3) != 0) revocation.client = below(2);
  std::vector<std::vector<Read>> reads(2);
  std::atomic<bool> isOver = false;
  std::latch start(static_cast<std::ptrdiff_t>(grants.size() + reads.size() + 1));
  const auto beginAfter = [&](std::uint64_t turns) {
    start.arrive_and_wait();
    for (std::atomic<std::uint64_t> turn = 0; turn < turns;) ++turn;
  };

  std::vector<std::thread> threads;
  for (Grant& grant : grants) {
    grant.client = below(4) == 0 ? 1 : 0;
    const auto turns = below(100'000);
    const bool isDirect = below(3) == 0;
    const std::string permission = kPermissions[below(kPermissions.size())];
    threads.emplace_back([&, turns, isDirect, permission] {
      beginAfter(turns);
      grant.began = tick();
      if (isDirect)
        authorize(grant.client);
      else
        request(grant.client, permission);
      grant.submitted = tick();
    });
  }
  for (std::size_t i = 0; i < reads.size(); ++i) {
    threads.emplace_back([&, i] {
      beginAfter(0);
      // Until the revocation is over, and twice more.
      for (int rest = 2; rest > 0; rest -= isOver ? 1 : 0) {
        Read one{i % 2, tick(), ""};
        one.token = read(one.client);
        reads[i].push_back(std::move(one));
        std::this_thread::yield();
      }
    });
  }
  threads.emplace_back([&, turns = below(400'000)] {
    beginAfter(turns);
    revoke(revocation);
    isOver = true;
  });
  for (std::thread& thread : threads) thread.join();
  waitForAnswers();

  std::vector<Read> all;
  for (auto& of : reads) all.insert(all.end(), of.begin(), of.end());
  check(grants, all, revocation, seed);
}

void Interleavings::check(const std::vector<Grant>& grants,
                          const std::vector<Read>& reads,
                          const Revocation& revocation,
                          std::uint64_t seed) {
  for (const std::size_t client : affectedBy(revocation)) {
    // A grant that the revocation did not find in the table may have come after it.
    bool hasNewGrant = false;
    for (const Grant& grant : grants)
      hasNewGrant = hasNewGrant || (grant.client == client && grant.submitted > revocation.began);
    const auto record = state_.records->find(kType, kClients[client]);
    if (!hasNewGrant) {
      ++overtaken_;
      const bool isGranted = record && record->granted;
      wrongGrants_ += isGranted || !sealedOf(client).empty() ? 1 : 0;
      EXPECT_FALSE(isGranted) << "seed " << seed;
      EXPECT_EQ(sealedOf(client), "") << "seed " << seed;
    }
    for (const Read& one : reads) {
      if (one.client != client || one.began < revocation.returned) continue;
      ++readsAfterReturn_;
      const bool isOfAnEarlierRun =
          !one.token.empty() && one.token.find("-" + std::to_string(seed) + "-") == std::string::npos;
      const bool isWrong = !one.token.empty() && (!hasNewGrant || isOfAnEarlierRun);
      wrongReads_ += isWrong ? 1 : 0;
      EXPECT_FALSE(isWrong) << "seed " << seed << ": " << one.token;
    }
  }
  for (const Read& one : reads) readsThatGave_ += one.token.empty() ? 0 : 1;
  EXPECT_EQ(revocation.leftovers, 0U) << "seed " << seed;
  leftovers_ += revocation.leftovers;

  std::vector<std::string> secrets = revocation.sealed;
  for (const Read& one : reads) {
    if (one.token.empty() || secrets.size() > 20) continue;
    secrets.push_back(one.token);
    std::string encoded(
        sodium_base64_ENCODED_LEN(one.token.size(), sodium_base64_VARIANT_ORIGINAL_NO_PADDING), '\0');
    sodium_bin2base64(encoded.data(),
                      encoded.size(),
                      reinterpret_cast<const unsigned char*>(one.token.data()),
                      one.token.size(),
                      sodium_base64_VARIANT_ORIGINAL_NO_PADDING);
    secrets.push_back(encoded.c_str());
    std::string hex(one.token.size() * 2 + 1, '\0');
    sodium_bin2hex(
        hex.data(), hex.size(), reinterpret_cast<const unsigned char*>(one.token.data()), one.token.size());
    secrets.push_back(hex.c_str());
  }
  const std::size_t found = countOnDisk(secrets);
  EXPECT_EQ(found, 0U) << "seed " << seed;
  onDisk_ += found;
}

TEST_F(Interleavings, OfARevocationWithGrantsAndReadsLeaveNothingToReadAfterIt) {
#if defined(__SANITIZE_THREAD__) || defined(__SANITIZE_ADDRESS__)
  const std::uint64_t usual = 200;
#else
  const std::uint64_t usual = 1000;
#endif
  const std::uint64_t count = numberFrom("RVD_INTERLEAVINGS", usual);
  const std::uint64_t seed = numberFrom("RVD_INTERLEAVINGS_SEED", std::random_device()());
  std::cout << "seed " << seed << ", " << count << " interleavings\n";
  for (std::uint64_t i = 0; i < count && !HasFailure(); ++i) runOne(seed + i);
  std::cout << overtaken_ << " times everything that grants began before the revocation: " << wrongGrants_
            << " grants, " << leftovers_ << " credentials stored when it returned\n"
            << readsAfterReturn_ << " reads after it returned: " << wrongReads_
            << " gave a credential before a new grant began; " << onDisk_ << " found in the files\n"
            << decided_ << " requests decided, " << voided_ << " void; " << readsThatGave_
            << " reads gave a credential at other times\n";
  // Else nothing was shown.
  EXPECT_GT(overtaken_, 0U);
  EXPECT_GT(voided_, 0);
  EXPECT_GT(decided_, 0);
  EXPECT_GT(readsThatGave_, 0U);
}

}  // namespace
