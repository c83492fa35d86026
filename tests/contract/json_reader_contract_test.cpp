// What every JSON reader owes a plug-in: run over the daemon's own and over the one of the tests.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <pthread.h>

#include <functional>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "daemon/http/JSONReader.h"
#include "tests/fakes/FakeTexts.h"

namespace {

using testing::HasSubstr;
using testing::Not;

struct Implementation {
  const char* name;
  std::function<std::unique_ptr<RVJSONReader>()> make;
};

class AJSONReader : public testing::TestWithParam<Implementation> {
 protected:
  void expectValue(const std::string& document, const RVValue& value) {
    const RVJSONResult result = reader->objectWithData(document);
    ASSERT_TRUE(result.value) << document << ": " << textOf(result);
    EXPECT_FALSE(result.error) << document;
    EXPECT_TRUE(*result.value == value) << document;
  }

  std::string expectRefused(const std::string& document) {
    const RVJSONResult result = reader->objectWithData(document);
    const std::string start = document.substr(0, 80);
    EXPECT_FALSE(result.value) << start;
    if (!result.error) {
      ADD_FAILURE() << "no error: " << start;
      return {};
    }
    EXPECT_EQ(result.error->domain, "com.zentor.json");
    EXPECT_NE(textOf(result), "") << start;
    return textOf(result);
  }

  static std::string textOf(const RVJSONResult& result) {
    return result.error ? result.error->localizedDescription().value_or("") : "";
  }

  const std::unique_ptr<RVJSONReader> reader = GetParam().make();
};

TEST_P(AJSONReader, ReadsADocumentOfAnyKind) {
  expectValue("null", RVValue());
  expectValue("true", true);
  expectValue(" \t\r\nfalse \n", false);
  expectValue("\"text\"", "text");
  expectValue("\"\"", "");
  expectValue("0", 0);
  expectValue("-0", 0);
  expectValue("-17", -17);
  expectValue("[]", RVArray{});
  expectValue("{}", RVDictionary{});
  expectValue("[1,[2],{\"a\":[]}]", RVArray{1, RVArray{2}, RVDictionary{{"a", RVArray{}}}});
  expectValue(
      "{\"access_token\":\"t\",\"permissions\":[\"a\",null],\"n\":{\"x\":true}}",
      RVDictionary{
          {"access_token", "t"}, {"permissions", RVArray{"a", RVValue()}}, {"n", RVDictionary{{"x", true}}}});
}

TEST_P(AJSONReader, TellsIntegersFromRealNumbers) {
  expectValue("1.0", 1.0);
  expectValue("1e2", 100.0);
  expectValue("1E-2", 0.01);
  expectValue("-1.5", -1.5);
  expectValue("9223372036854775807", std::numeric_limits<std::int64_t>::max());
  expectValue("-9223372036854775808", std::numeric_limits<std::int64_t>::min());
  expectValue("1e308", 1e308);
  expectValue("9223372036854775808.0", 9223372036854775808.0);
}

TEST_P(AJSONReader, RefusesIntegersBeyond64Bits) {
  for (const char* document : {"9223372036854775808",
                               "-9223372036854775809",
                               "18446744073709551615",
                               "18446744073709551616",
                               "[1,123456789012345678901234567890]"})
    expectRefused(document);
  expectRefused(std::string(5000, '9'));
}

TEST_P(AJSONReader, RefusesRealNumbersBeyondADouble) {
  for (const char* document : {"1e400", "-1e400", "[1.7976931348623159e308]"}) expectRefused(document);
}

TEST_P(AJSONReader, ReadsEscapesAndOtherScripts) {
  expectValue(R"("\"\\\/\b\f\n\r\t")", "\"\\/\b\f\n\r\t");
  expectValue(R"("\u00fc\u20AC\ud83d\ude00")", "\xC3\xBC\xE2\x82\xAC\xF0\x9F\x98\x80");
  expectValue("\"\xC3\xBC\xF0\x9F\x98\x80\"", "\xC3\xBC\xF0\x9F\x98\x80");
  expectValue(R"("a\u0000b")", std::string("a\0b", 3));
  expectValue(R"({"\u0061":1})", RVDictionary{{"a", 1}});
}

TEST_P(AJSONReader, RefusesWhatIsNotJSON) {
  for (const char* document : {"",           " ",
                               "nul",        "True",
                               "NaN",        "Infinity",
                               "-",          "+1",
                               "01",         "1.",
                               ".5",         "1e",
                               "0x10",       "'a'",
                               "a",          "[",
                               "]",          "{",
                               "}",          "[1",
                               "[1,",        "[1,]",
                               "[,1]",       "[1 2]",
                               "{\"a\"}",    "{\"a\":}",
                               "{\"a\":1,}", "{a:1}",
                               "{1:1}",      "{\"a\" 1}",
                               "[1}",        "{\"a\":1]",
                               "\"",         "\"a",
                               "\"\\",       "\"\\x\"",
                               "\"\\u12\"",  "\"\\u123g\"",
                               "\"a\nb\"",   "\"\t\"",
                               "/* x */ 1",  "1 // x",
                               "# x\n1",     ",",
                               ":",          "<html></html>"})
    expectRefused(document);
}

TEST_P(AJSONReader, RefusesWhatFollowsTheDocument) {
  for (const std::string& document : {std::string("{} {}"),
                                      std::string("1 2"),
                                      std::string("\"a\"x"),
                                      std::string("[]]"),
                                      std::string("{}\0", 3),
                                      std::string("{}\0{\"a\":1}", 10),
                                      std::string("\0", 1),
                                      std::string("[1,\0 2]", 7)})
    expectRefused(document);
}

TEST_P(AJSONReader, RefusesAByteOrderMark) {
  expectRefused("\xEF\xBB\xBF{}");
  expectRefused("\xEF\xBB\xBF");
  expectRefused(std::string("\xFF\xFE{\0}\0", 6));
}

TEST_P(AJSONReader, RefusesWhatIsNotUTF8) {
  for (const char* text : {"\xFF",
                           "\x80",
                           "\xC3",
                           "\xC3(",
                           "\xC0\xAF",
                           "\xE0\x80\xAF",
                           "\xED\xA0\x80",
                           "\xF4\x90\x80\x80",
                           "\xF8\x88\x80\x80\x80",
                           "\xE2\x82"})
    expectRefused(std::string("\"") + text + "\"");
  for (const char* escape :
       {R"("\ud800")", R"("\udc00")", R"("\ud800\ud800")", R"("\ud800x")", R"("\ud800\u0061")"})
    expectRefused(escape);
}

TEST_P(AJSONReader, RefusesRepeatedKeysOfOneObjectAlone) {
  for (const char* document : {R"({"a":1,"a":1})",
                               R"({"a":1,"b":2,"a":3})",
                               R"({"a":1,"\u0061":2})",
                               R"([{"x":{"a":null,"a":null}}])",
                               R"({"":1,"":2})",
                               R"({"a":{"b":1},"a":2})"})
    expectRefused(document);
  expectValue(R"([{"a":1},{"a":1}])", RVArray{RVDictionary{{"a", 1}}, RVDictionary{{"a", 1}}});
  expectValue(R"({"a":{"a":1},"b":{"a":2}})",
              RVDictionary{{"a", RVDictionary{{"a", 1}}}, {"b", RVDictionary{{"a", 2}}}});
}

TEST_P(AJSONReader, ReadsUpTo64LevelsAndNoMore) {
  const auto nested = [](std::size_t depth) { return std::string(depth, '[') + std::string(depth, ']'); };
  EXPECT_TRUE(reader->objectWithData(nested(64)).value);
  expectRefused(nested(65));
  std::string objects;
  for (int i = 0; i < 65; ++i) objects += "{\"a\":";
  expectRefused(objects + "1" + std::string(65, '}'));
  EXPECT_TRUE(reader->objectWithData("[" + nested(63) + "," + nested(63) + "]").value);
}

TEST_P(AJSONReader, ReadsUpToOneMebibyteAndNoMore) {
  const std::string largest = "\"" + std::string((1 << 20) - 2, 'x') + "\"";
  EXPECT_TRUE(reader->objectWithData(largest).value);
  expectRefused(largest + " ");
}

TEST_P(AJSONReader, NeedsLittleStackHoweverDeepADocumentIs) {
  const std::string brackets(100'000, '[');
  const std::string many(1'000'000, '[');
  std::function<void()> work = [&] {
    expectRefused(brackets);
    expectRefused(many);
    EXPECT_TRUE(reader->objectWithData(std::string(64, '[') + std::string(64, ']')).value);
  };
  pthread_attr_t attributes;
  pthread_attr_init(&attributes);
  pthread_attr_setstacksize(&attributes, 256 * 1024);
  pthread_t thread;
  const auto run = [](void* argument) -> void* {
    (*static_cast<std::function<void()>*>(argument))();
    return nullptr;
  };
  ASSERT_EQ(pthread_create(&thread, &attributes, run, &work), 0);
  pthread_join(thread, nullptr);
  pthread_attr_destroy(&attributes);
}

TEST_P(AJSONReader, QuotesNothingOfTheDocumentInItsErrors) {
  for (const std::string& document : {std::string(R"({"access_token":"canary","x":canary})"),
                                      std::string(R"({"canary":1,"canary":2})"),
                                      std::string(R"(["canary)"),
                                      std::string(R"({"canary" "canary"})"),
                                      std::string("canary"),
                                      std::string(R"({"access_token":"canary\q"})"),
                                      std::string("\"canary\xFF\""),
                                      std::string(R"({"access_token":"canary","n":1e999})"),
                                      std::string("\"canary\" \"canary\""),
                                      std::string(R"({"canary":99999999999999999999})"),
                                      std::string("\xEF\xBB\xBF\"canary\""),
                                      std::string("\"canary\"\0canary", 15),
                                      std::string("'canary'")})
    EXPECT_THAT(expectRefused(document), Not(HasSubstr("canary")));
}

TEST_P(AJSONReader, KeepsNothingBetweenDocuments) {
  expectRefused("{\"a\":1,");
  expectValue("{\"b\":2}", RVDictionary{{"b", 2}});
}

INSTANTIATE_TEST_SUITE_P(
    EachReader,
    AJSONReader,
    testing::Values(Implementation{"Daemon", [] { return std::make_unique<http::JSONReader>(); }},
                    Implementation{"Fake", [] { return std::make_unique<fakes::FakeJSONReader>(); }}),
    [](const auto& one) { return one.param.name; });

// What the daemon's own says beyond that.
class TheDaemonsJSONReader : public testing::Test {
 protected:
  std::pair<std::int64_t, std::string> errorOf(std::string_view document) {
    const RVJSONResult result = reader.objectWithData(document);
    if (!result.error) return {0, "no error"};
    return {result.error->code, result.error->localizedDescription().value_or("")};
  }
  http::JSONReader reader;
};

TEST_F(TheDaemonsJSONReader, SaysWhatIsWrongAndWhere) {
  const auto code = [](http::JSONErrorCode one) { return static_cast<std::int64_t>(one); };
  using Code = http::JSONErrorCode;
  auto [number, text] = errorOf("{\n  \"a\": x\n}");
  EXPECT_EQ(number, code(Code::kNotJSON));
  EXPECT_THAT(text, HasSubstr("line 2, column 8"));
  EXPECT_THAT(text, HasSubstr("invalid literal"));
  std::tie(number, text) = errorOf("{\"a\":1,\n\"a\":2}");
  EXPECT_EQ(number, code(Code::kRepeatedKey));
  EXPECT_THAT(text, HasSubstr("line 2, column 3"));
  std::tie(number, text) = errorOf(std::string(100'000, '['));
  EXPECT_EQ(number, code(Code::kTooDeep));
  EXPECT_THAT(text, HasSubstr("line 1, column 65"));
  EXPECT_THAT(text, HasSubstr("deeper than 64"));
  std::tie(number, text) = errorOf("[1e999]");
  EXPECT_EQ(number, code(Code::kNumberOutOfRange));
  std::tie(number, text) = errorOf("[99999999999999999999]");
  EXPECT_EQ(number, code(Code::kNumberOutOfRange));
  std::tie(number, text) = errorOf(std::string((1 << 20) + 1, ' '));
  EXPECT_EQ(number, code(Code::kTooLarge));
  std::tie(number, text) = errorOf(std::string_view("{}\0", 3));
  EXPECT_EQ(number, code(Code::kNotJSON));
  EXPECT_THAT(text, HasSubstr("line 1, column 3"));
  std::tie(number, text) = errorOf("");
  EXPECT_EQ(number, code(Code::kNotJSON));
  EXPECT_THAT(text, HasSubstr("unexpected end of input"));
}

}  // namespace
