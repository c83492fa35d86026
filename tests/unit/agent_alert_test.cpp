#include <gtest/gtest.h>

#include "agents/common/Alert.h"
#include "tests/support/HostileTexts.h"

namespace {

agents::Alert anAlert() {
  return {"Facebook",
          "Photo App would like to see your email address.",
          "OK",
          "Don't Allow",
          "org.example.PhotoApp",
          "registered"};
}

TEST(AnAlertsText, IsWhatTheDaemonSent) {
  const agents::AlertText text = agents::textOf(anAlert());
  EXPECT_EQ(text.header, "Facebook");
  EXPECT_EQ(text.message, "Photo App would like to see your email address.");
  EXPECT_EQ(text.defaultButtonTitle, "OK");
  EXPECT_EQ(text.alternateButtonTitle, "Don't Allow");
}

TEST(AnAlertsText, HasTheNamesThatTheDaemonIsolatedAsTheyAre) {
  agents::Alert alert = anAlert();
  alert.message = "\u201c\u2068Photo App\u2069\u201d would like to see \u2068more\u2069.";
  EXPECT_EQ(agents::textOf(alert).message, "\u201cPhoto App\u201d would like to see more.");
  alert.message = "\u2068Photo\u202eApp\u2069";
  EXPECT_EQ(agents::textOf(alert).message, "Photo\\u{202e}App");
}

TEST(AnAlertsText, SaysWhoAsksAndHowThatIsKnown) {
  agents::Alert alert = anAlert();
  EXPECT_EQ(agents::textOf(alert).askedBy, "Asked by org.example.PhotoApp, as the program itself says.");
  alert.evidence = "sandbox";
  EXPECT_EQ(agents::textOf(alert).askedBy, "Asked by org.example.PhotoApp, as its sandbox says.");
  alert.evidence = "scope";
  EXPECT_EQ(agents::textOf(alert).askedBy, "Asked by org.example.PhotoApp, as which the session started it.");
  alert.evidence = "a\nb";
  EXPECT_EQ(agents::textOf(alert).askedBy, "Asked by org.example.PhotoApp (known by: a\\nb).");
  alert.evidence.reset();
  EXPECT_EQ(agents::textOf(alert).askedBy, "Asked by org.example.PhotoApp.");
}

TEST(AnAlertsText, SaysWhenNobodyKnowsWhoAsks) {
  agents::Alert alert = anAlert();
  alert.clientID.reset();
  alert.evidence = "unknown";
  EXPECT_EQ(agents::textOf(alert).askedBy, "Asked by a program that does not say which application it is.");
}

TEST(AnAlertsText, HidesNothingInAnyOfItsParts) {
  for (const std::string& hostile : support::hostileTexts()) {
    const agents::AlertText text = agents::textOf({hostile, hostile, hostile, hostile, hostile, hostile});
    for (const std::string& part :
         {text.header, text.message, text.defaultButtonTitle, text.alternateButtonTitle, text.askedBy})
      EXPECT_TRUE(support::hidesNothing(part)) << testing::PrintToString(hostile);
  }
}

TEST(AnAlert, WithoutAHeaderOrAClientCanBeShown) {
  agents::Alert alert = anAlert();
  alert.header.clear();
  alert.clientID.reset();
  alert.evidence.reset();
  EXPECT_TRUE(agents::canBeShown(alert));
}

TEST(AnAlert, InWhoseMessageOrTitlesNothingCanBeSeenCannotBeShown) {
  for (std::string agents::Alert::*part :
       {&agents::Alert::message, &agents::Alert::defaultButtonTitle, &agents::Alert::alternateButtonTitle})
    for (const char* blank : {"", " ", "\n\t", "\u200b\u202e\u2066", "\u3164\u2800", "\u00a0"}) {
      agents::Alert alert = anAlert();
      alert.*part = blank;
      EXPECT_FALSE(agents::canBeShown(alert)) << testing::PrintToString(blank);
    }
}

}  // namespace
