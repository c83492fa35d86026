#include <gtest/gtest.h>
#include <sdbus-c++/sdbus-c++.h>

#include <limits>
#include <nlohmann/json.hpp>
#include <vector>

#include "cli/Values.h"

namespace {

using cli::Json;
using sdbus::Variant;
using Dictionary = std::map<std::string, Variant>;

TEST(AValueOfTheBus, BecomesItsDocument) {
  EXPECT_EQ(cli::jsonFrom(Variant("text")), Json("text"));
  EXPECT_EQ(cli::jsonFrom(Variant(true)), Json(true));
  EXPECT_EQ(cli::jsonFrom(Variant(std::int64_t{-5})), Json(-5));
  EXPECT_EQ(cli::jsonFrom(Variant(std::int32_t{7})), Json(7));
  EXPECT_EQ(cli::jsonFrom(Variant(0.5)), Json(0.5));
  EXPECT_EQ(cli::jsonFrom(Variant(std::vector<std::string>{"a", "b"})), Json::array({"a", "b"}));
  EXPECT_EQ(cli::jsonFrom(Variant(std::vector<Variant>{Variant("a"), Variant(true)})),
            Json::array({"a", true}));
  EXPECT_EQ(cli::jsonFrom(Variant(Dictionary{{"k", Variant(Variant("v"))}})), Json::object({{"k", "v"}}));
}

TEST(AValueOfTheBus, ThatTheDaemonNeverSendsIsNull) {
  EXPECT_TRUE(cli::jsonFrom(Variant(std::uint8_t{1})).is_null());
  EXPECT_TRUE(cli::jsonFrom(Variant(std::vector<std::uint32_t>{1})).is_null());
}

TEST(ADocument, ComesBackFromTheBusAsItWas) {
  for (const char* text : {"true",
                           "-1",
                           "9223372036854775807",
                           "-9223372036854775808",
                           "0.25",
                           "\"\"",
                           "[]",
                           "{}",
                           "[1,[\"a\",{\"b\":[false]}]]",
                           R"({"a":{"b":1.5},"c":"d"})"}) {
    const Json document = Json::parse(text);
    const auto variant = cli::variantFrom(document);
    ASSERT_TRUE(variant) << text;
    EXPECT_EQ(cli::jsonFrom(*variant), document);
  }
}

TEST(ADocument, KeepsIntegersAndRealsApart) {
  EXPECT_EQ((*cli::variantFrom(Json::parse("1"))).peekValueType(), "x");
  EXPECT_EQ((*cli::variantFrom(Json::parse("1.0"))).peekValueType(), "d");
}

TEST(ADocument, ThatTheBusCannotCarryIsRefused) {
  for (const char* text :
       {"null", "[null]", "{\"a\":null}", "9223372036854775808", "\"a\\u0000b\"", "{\"\\u0000\":1}"}) {
    const auto variant = cli::variantFrom(Json::parse(text));
    ASSERT_FALSE(variant) << text;
    EXPECT_EQ(variant.failure().kind, base::FailureKind::kInvalid);
  }
}

TEST(ADocument, HasAtMostSixteenLevels) {
  const auto nested = [](std::size_t levels) {
    return Json::parse(std::string(levels, '[') + std::string(levels, ']'));
  };
  EXPECT_TRUE(cli::variantFrom(nested(16)));
  EXPECT_FALSE(cli::variantFrom(nested(17)));
  EXPECT_FALSE(cli::variantFrom(nested(10'000)));
}

}  // namespace
