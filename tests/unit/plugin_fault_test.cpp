// What is owed is given, whatever the host does: every call of every service is made to throw once.
#include <stdexcept>

#include "Facebook/FacebookAccessPlugin/Owed.h"
#include "tests/unit/plugin_fixture.h"

namespace plugin_tests {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

const std::string kDefaultAccess(kRVDFacebookAccountsDefaultAccessEntitlement);

struct HostFault : std::runtime_error {
  using std::runtime_error::runtime_error;
};

// One call of the plug-in, over a host that has been prepared for it.
struct Scenario {
  const char* name;
  std::function<void(fakes::FakeHost&)> prepare;
  std::function<void(TKFacebookAccountAccessPlugin&, fakes::FakeHost&, RVDAccessCompletion)> call;
};

void PrintTo(const Scenario& scenario, std::ostream* out) {
  *out << scenario.name;
}

void putRecord(fakes::FakeHost& host, const char* clientID, bool granted) {
  const auto client = std::make_shared<fakes::FakeClient>(clientID);
  RVDClientAuthorization authorization(client);
  authorization.setIsGranted(granted);
  authorization.setGrantedPermissions(RVPermissionSet{"user_likes"});
  authorization.setOptions(keptOptions("111", "everyone"));
  host.store->records().setAuthorization(authorization, *client, *host.accountType);
}

void prepareNothing(fakes::FakeHost&) {
}

auto requestOf(std::set<std::string, std::less<>> entitlements, const RVDictionary& options) {
  return [=](TKFacebookAccountAccessPlugin& plugin, fakes::FakeHost& host, RVDAccessCompletion completion) {
    plugin.handleAccessRequestToAccountsOfType(host.accountType,
                                               host.makeClient("org.example.PhotoApp", entitlements),
                                               options,
                                               host.store,
                                               true,
                                               std::move(completion));
  };
}

void authorize(TKFacebookAccountAccessPlugin& plugin, fakes::FakeHost& host, RVDAccessCompletion completion) {
  plugin.authorizeAccessToAccountsOfType(
      host.accountType, host.makeClient(), host.store, std::move(completion));
}

void revoke(TKFacebookAccountAccessPlugin& plugin, fakes::FakeHost& host, RVDAccessCompletion completion) {
  plugin.revokeAccessToAccountsOfType(host.accountType, host.makeClient(), host.store, std::move(completion));
}

void revokeAll(TKFacebookAccountAccessPlugin& plugin, fakes::FakeHost& host, RVDAccessCompletion completion) {
  plugin.revokeAllAccessToAccountsOfType(host.accountType, host.store, std::move(completion));
}

const std::vector<Scenario> kScenarios = {
    {"first request, allowed",
     prepareNothing,
     requestOf({}, optionsFor({"email", "publish_stream", "manage_pages"}, "friends"))},
    {"first request, refused",
     [](fakes::FakeHost& host) { host.userNotifications.answerWith({1}); },
     requestOf({}, optionsFor({"email"}))},
    {"first request of something unknown",
     prepareNothing,
     requestOf({}, optionsFor({"email", "something_new"}))},
    {"request for more",
     [](fakes::FakeHost& host) { putRecord(host, "org.example.PhotoApp", true); },
     requestOf({}, optionsFor({"user_likes", "user_photos"}))},
    {"request for what is held",
     [](fakes::FakeHost& host) { putRecord(host, "org.example.PhotoApp", true); },
     requestOf({}, optionsFor({"user_likes"}))},
    {"request with invalid options", prepareNothing, requestOf({}, {})},
    {"request without an account",
     [](fakes::FakeHost& host) { host.store->removeAccounts(); },
     requestOf({}, optionsFor({"email"}))},
    {"default access",
     [](fakes::FakeHost& host) { host.keychain.setMasterToken("account-1", std::nullopt); },
     requestOf({kDefaultAccess}, optionsFor({"email"}))},
    {"default access without an account",
     [](fakes::FakeHost& host) { host.store->removeAccounts(); },
     requestOf({kDefaultAccess}, optionsFor({"email"}))},
    {"ignored request",
     [](fakes::FakeHost& host) {
       host.preferences.store(TKFacebookIgnoreAccessRequests, TKFacebookPreferencesAppID, 1);
     },
     requestOf({}, optionsFor({"email"}))},
    {"server refuses",
     [](fakes::FakeHost& host) {
       host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withBody("{}")});
     },
     requestOf({}, optionsFor({"email"}))},
    {"server cannot be understood",
     [](fakes::FakeHost& host) {
       host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withBody("}")});
     },
     requestOf({}, optionsFor({"email"}))},
    {"server does not answer",
     [](fakes::FakeHost& host) {
       host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withoutAnything()});
     },
     requestOf({}, optionsFor({"email"}))},
    {"direct authorization of a new client", prepareNothing, authorize},
    {"direct authorization",
     [](fakes::FakeHost& host) { putRecord(host, "org.example.PhotoApp", false); },
     authorize},
    {"revocation", [](fakes::FakeHost& host) { putRecord(host, "org.example.PhotoApp", true); }, revoke},
    {"revocation of a new client", prepareNothing, revoke},
    {"revocation of all",
     [](fakes::FakeHost& host) {
       putRecord(host, "org.example.A", true);
       putRecord(host, "org.example.B", false);
     },
     revokeAll},
    {"revocation of all without an account",
     [](fakes::FakeHost& host) { host.store->removeAccounts(); },
     revokeAll},
};

// What came of one run of a scenario.
struct Outcome {
  std::size_t answers = 0;
  bool granted = false;
  std::optional<RVError> error;
  bool threw = false;
  std::string failedCall;
  bool faultWasOnCallingThread = false;
  std::vector<std::string> calls;
  std::size_t unreleasedAlerts = 0;
};

// Runs the scenario with the call of that index throwing.
Outcome run(const Scenario& scenario, std::optional<std::size_t> failingCall) {
  TKFacebookAccountAccessPluginTestAccess::forgetPreferencesQueue();
  Outcome result;
  {
    fakes::FakeHost host;
    scenario.prepare(host);
    host.journal->clear();
    const std::thread::id caller = std::this_thread::get_id();
    std::mutex mutex;
    host.journal->setBeforeCall([&](std::size_t index, const std::string& call) {
      if (index != failingCall) return;
      const std::lock_guard lock(mutex);
      result.failedCall = call;
      // The queue hands what its work throws to whoever waits for it.
      result.faultWasOnCallingThread =
          std::this_thread::get_id() == caller || call == "preferences.ZQPreferencesCopyValue";
      throw HostFault(call);
    });
    TKFacebookAccountAccessPlugin plugin(host.services());
    try {
      scenario.call(plugin, host, [&](bool granted, const std::optional<RVError>& error) {
        const std::lock_guard lock(mutex);
        ++result.answers;
        result.granted = granted;
        result.error = error;
      });
    } catch (const HostFault&) {
      result.threw = true;
    }
    host.facebookRequests.waitUntilDelivered();
    result.calls = host.journal->calls();
    result.unreleasedAlerts = host.userNotifications.unreleasedAlerts();
  }
  TKFacebookAccountAccessPluginTestAccess::forgetPreferencesQueue();
  return result;
}

class AFaultOfTheHost : public testing::TestWithParam<Scenario> {};

TEST_P(AFaultOfTheHost, AtWhicheverCallLeavesTheCompletionCalledOnce) {
  const Outcome sound = run(GetParam(), std::nullopt);
  EXPECT_EQ(sound.answers, 1U);
  EXPECT_FALSE(sound.threw);
  ASSERT_FALSE(sound.calls.empty());
  for (std::size_t i = 0; i < sound.calls.size(); ++i) {
    SCOPED_TRACE("call " + std::to_string(i) + ": " + sound.calls[i]);
    const Outcome faulty = run(GetParam(), i);
    EXPECT_EQ(faulty.answers, 1U);
    EXPECT_EQ(faulty.threw, faulty.faultWasOnCallingThread);
  }
}

TEST_P(AFaultOfTheHost, OnTheCallingThreadAnswersFalseWithoutAnErrorAndPassesThrough) {
  const Outcome sound = run(GetParam(), std::nullopt);
  for (std::size_t i = 0; i < sound.calls.size(); ++i) {
    SCOPED_TRACE("call " + std::to_string(i) + ": " + sound.calls[i]);
    const Outcome faulty = run(GetParam(), i);
    // An alert is released when its answer has been dealt with.
    if (!faulty.faultWasOnCallingThread || faulty.failedCall == "userNotifications.ZQRelease") continue;
    EXPECT_FALSE(faulty.granted);
    EXPECT_EQ(faulty.error, std::nullopt);
  }
}

INSTANTIATE_TEST_SUITE_P(InEveryCall,
                         AFaultOfTheHost,
                         testing::ValuesIn(kScenarios),
                         [](const testing::TestParamInfo<Scenario>& scenario) {
                           std::string name;
                           bool upper = true;
                           for (const char* c = scenario.param.name; *c != '\0'; ++c) {
                             const bool letter = (*c >= 'a' && *c <= 'z');
                             if (letter) name += upper ? static_cast<char>(*c - 'a' + 'A') : *c;
                             upper = !letter;
                           }
                           return name;
                         });

class ARequestInTrouble : public PluginTest {
 protected:
  const std::shared_ptr<fakes::FakeClient> client = host.makeClient();
};

TEST_F(ARequestInTrouble, IsAnsweredWhereTheServersHandlerIsDropped) {
  host.facebookRequests.replyToAuthorizations({fakes::FakeReply::dropped()});
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_FALSE(record());
}

TEST_F(ARequestInTrouble, IsAnsweredWhereTheDescriptionsHandlerIsDropped) {
  host.facebookRequests.replyToDescriptions({fakes::FakeReply::dropped()});
  const auto answer = request(client, optionsFor({"something_new"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, bareError(7));
}

TEST_F(ARequestInTrouble, IsAnsweredWhereAnExchangeCannotBeStarted) {
  host.facebookRequests.replyToAuthorizations({fakes::FakeReply::thrown()});
  Answers answers;
  EXPECT_THROW(plugin.handleAccessRequestToAccountsOfType(
                   host.accountType, client, optionsFor({"email"}), host.store, true, answers.completion()),
               std::runtime_error);
  const auto answer = onlyAnswerOf(answers);
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
}

TEST_F(ARequestInTrouble, IsAnsweredWhereTheHostStopsWhileTheServerIsAwaited) {
  host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withoutAnything().held()});
  Answers answers;
  plugin.handleAccessRequestToAccountsOfType(
      host.accountType, client, optionsFor({"email"}), host.store, true, answers.completion());
  EXPECT_EQ(answers.count(), 0U);
  ASSERT_TRUE(host.facebookRequests.waitForHeld(1));
  host.facebookRequests.dropHeld();
  const auto answer = onlyAnswerOf(answers);
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
}

TEST_F(ARequestInTrouble, IsAnsweredWhereTheHandlerIsDroppedAfterTheObjectIsGone) {
  host.facebookRequests.replyToAuthorizations({fakes::FakeReply::withoutAnything().held()});
  Answers answers;
  {
    TKFacebookAccountAccessPlugin shortLived(host.services());
    shortLived.handleAccessRequestToAccountsOfType(
        host.accountType, client, optionsFor({"email"}), host.store, true, answers.completion());
  }
  ASSERT_TRUE(host.facebookRequests.waitForHeld(1));
  host.facebookRequests.dropHeld();
  EXPECT_FALSE(onlyAnswerOf(answers).granted);
}

TEST_F(ARequestInTrouble, IsAnsweredOnceWhereTheRecordCannotBeWrittenOnTheServersThread) {
  host.store->records().setBeforeCall([](std::string_view method) {
    if (method == "setAuthorization") throw HostFault("no disk");
  });
  const auto answer = request(client, optionsFor({"email"}));
  EXPECT_FALSE(answer.granted);
  EXPECT_EQ(answer.error, std::nullopt);
  EXPECT_EQ(host.facebookRequests.handlerExceptions(), 1U);
}

class ACompletionThatThrows : public PluginTest {
 protected:
  RVDAccessCompletion completion() {
    return [this](bool, const std::optional<RVError>&) {
      ++calls;
      throw std::logic_error("the daemon is at fault");
    };
  }

  std::atomic<int> calls = 0;
  const std::shared_ptr<fakes::FakeClient> client = host.makeClient();
};

TEST_F(ACompletionThatThrows, IsNotCalledAgainAndItsExceptionPassesThrough) {
  EXPECT_THROW(plugin.handleAccessRequestToAccountsOfType(
                   host.accountType, client, {}, host.store, true, completion()),
               std::logic_error);
  EXPECT_THROW(plugin.authorizeAccessToAccountsOfType(host.accountType, client, host.store, completion()),
               std::logic_error);
  EXPECT_THROW(plugin.revokeAccessToAccountsOfType(host.accountType, client, host.store, completion()),
               std::logic_error);
  EXPECT_THROW(plugin.revokeAllAccessToAccountsOfType(host.accountType, host.store, completion()),
               std::logic_error);
  EXPECT_EQ(calls, 4);
}

TEST_F(ACompletionThatThrows, IsNotCalledAgainWhereTheAlertWasAnswered) {
  host.userNotifications.answerWith({1});
  EXPECT_THROW(plugin.handleAccessRequestToAccountsOfType(
                   host.accountType, client, optionsFor({"email"}), host.store, true, completion()),
               std::logic_error);
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(host.userNotifications.unreleasedAlerts(), 0U);
}

TEST_F(ACompletionThatThrows, ThrowsToWhoeverDeliversTheServersAnswer) {
  plugin.handleAccessRequestToAccountsOfType(
      host.accountType, client, optionsFor({"email"}), host.store, true, completion());
  host.facebookRequests.waitUntilDelivered();
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(host.facebookRequests.handlerExceptions(), 1U);
  EXPECT_TRUE(record()->isGranted());
}

TEST_F(ACompletionThatThrows, IsHeardByNobodyWhereAnotherExceptionIsOnItsWay) {
  host.store->setBeforeCall([](std::string_view) { throw HostFault("no store"); });
  EXPECT_THROW(plugin.revokeAccessToAccountsOfType(host.accountType, client, host.store, completion()),
               HostFault);
  EXPECT_EQ(calls, 1);
}

class ADebt : public testing::Test {
 protected:
  using OwedText = Owed<void(int, const std::string&)>;

  OwedText debt() {
    return OwedText(
        [this](int number, const std::string& text) { paid.emplace_back(number, text); }, -1, "nothing");
  }

  std::vector<std::pair<int, std::string>> paid;
};

TEST_F(ADebt, IsPaidWithTheArgumentsOfTheFirstCall) {
  {
    const OwedText owed = debt();
    owed(1, "one");
    owed(2, "two");
  }
  EXPECT_THAT(paid, ElementsAre(std::pair(1, std::string("one"))));
}

TEST_F(ADebt, IsPaidWithTheFallbackWhereNobodyCalls) {
  debt();
  EXPECT_THAT(paid, ElementsAre(std::pair(-1, std::string("nothing"))));
}

TEST_F(ADebt, IsPaidOnceForAllItsCopies) {
  {
    const OwedText owed = debt();
    const std::function<void(int, const std::string&)> copy = owed;
    { const OwedText another = owed; }
    EXPECT_THAT(paid, IsEmpty());
    copy(3, "three");
    owed(4, "four");
  }
  EXPECT_THAT(paid, ElementsAre(std::pair(3, std::string("three"))));
}

TEST_F(ADebt, IsPaidWhenTheLastCopyGoesWithoutACall) {
  auto owed = std::make_unique<OwedText>(debt());
  auto copy = std::make_unique<OwedText>(*owed);
  owed.reset();
  EXPECT_THAT(paid, IsEmpty());
  copy.reset();
  EXPECT_THAT(paid, ElementsAre(std::pair(-1, std::string("nothing"))));
}

TEST_F(ADebt, LetsAnExceptionOfTheCallbackPassAndIsPaidThen) {
  int calls = 0;
  {
    const Owed<void()> owed([&] {
      ++calls;
      throw HostFault("no");
    });
    EXPECT_THROW(owed(), HostFault);
  }
  EXPECT_EQ(calls, 1);
}

TEST_F(ADebt, KeepsAnExceptionToItselfWhereItIsPaidAtTheEnd) {
  int calls = 0;
  EXPECT_NO_THROW(Owed<void()>([&] {
    ++calls;
    throw HostFault("no");
  }));
  EXPECT_EQ(calls, 1);
}

TEST_F(ADebt, LetsGoOfWhatTheCallbackHoldsOnceItIsPaid) {
  const auto held = std::make_shared<int>(1);
  const Owed<void()> owed([held] { static_cast<void>(held); });
  EXPECT_EQ(held.use_count(), 2);
  owed();
  EXPECT_EQ(held.use_count(), 1);
}

}  // namespace
}  // namespace plugin_tests
