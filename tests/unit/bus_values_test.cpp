#include <gtest/gtest.h>
#include <sdbus-c++/sdbus-c++.h>

#include <limits>
#include <memory>

#include "daemon/bus/Names.h"
#include "daemon/bus/Values.h"
#include "tests/support/PrivateBus.h"

namespace bus {
namespace {

// Messages that are written, and then read as if they had arrived.
class OnABus : public testing::Test {
 protected:
  sdbus::MethodCall makeMessage() { return proxy_->createMethodCall("org.example.Interface", "Method"); }

 private:
  const PrivateBus bus_;
  const std::unique_ptr<sdbus::IConnection> connection_ =
      sdbus::createSessionBusConnectionWithAddress(bus_.address());
  const std::unique_ptr<sdbus::IProxy> proxy_ = sdbus::createProxy(*connection_, "org.example", "/");
};

class AValue : public OnABus {
 protected:
  // What is read of a variant that holds `content`.
  template <typename T>
  RVValue read(const T& content) {
    return readVariantOf(sdbus::Variant(content));
  }
  RVValue readVariantOf(const sdbus::Variant& variant) {
    auto message = makeMessage();
    message << variant;
    message.seal();
    message.rewind(true);
    SizeLimit limit{size_};
    return readVariant(message, limit);
  }
  template <typename T>
  std::string errorOf(const T& content) {
    try {
      read(content);
    } catch (const sdbus::Error& error) {
      return error.getName();
    }
    return "";
  }
  RVValue back(const RVValue& value) {
    auto message = makeMessage();
    writeVariant(message, value);
    message.seal();
    message.rewind(true);
    SizeLimit limit{size_};
    return readVariant(message, limit);
  }
  std::size_t size_ = 1 << 20;
};

TEST_F(AValue, OfEveryKindOfStringIsAString) {
  EXPECT_EQ(read(std::string("text")), RVValue("text"));
  EXPECT_EQ(read(sdbus::ObjectPath("/a/b")), RVValue("/a/b"));
  EXPECT_EQ(read(sdbus::Signature("as")), RVValue("as"));
}

TEST_F(AValue, OfEveryKindOfIntegerIsAnInteger) {
  EXPECT_EQ(read(std::uint8_t{255}), RVValue(255));
  EXPECT_EQ(read(std::int16_t{-2}), RVValue(-2));
  EXPECT_EQ(read(std::uint16_t{65535}), RVValue(65535));
  EXPECT_EQ(read(std::int32_t{-3}), RVValue(-3));
  EXPECT_EQ(read(std::uint32_t{4294967295U}), RVValue(std::int64_t{4294967295}));
  EXPECT_EQ(read(std::numeric_limits<std::int64_t>::min()),
            RVValue(std::numeric_limits<std::int64_t>::min()));
  EXPECT_EQ(read(std::uint64_t{9223372036854775807U}), RVValue(std::numeric_limits<std::int64_t>::max()));
}

TEST_F(AValue, ThatIsAnIntegerBeyond64BitsWithSignCannotBeHandedOn) {
  EXPECT_EQ(errorOf(std::uint64_t{9223372036854775808U}), kInvalidArgs);
}

TEST_F(AValue, OfTheOtherSimpleKindsStaysWhatItIs) {
  EXPECT_EQ(read(true), RVValue(true));
  EXPECT_EQ(read(0.5), RVValue(0.5));
}

TEST_F(AValue, ThatIsAnArrayOrAStructureIsAnArray) {
  EXPECT_EQ(read(std::vector<std::string>{"a", "b"}), RVValue(RVArray{"a", "b"}));
  EXPECT_EQ(read(std::vector<std::string>{}), RVValue(RVArray{}));
  EXPECT_EQ(read(sdbus::make_struct(std::string("a"), std::int32_t{1})), RVValue(RVArray{"a", 1}));
}

TEST_F(AValue, ThatIsADictionaryWithStringKeysIsADictionary) {
  EXPECT_EQ(read(std::map<std::string, std::int32_t>{{"a", 1}}), RVValue(RVDictionary{{"a", 1}}));
  EXPECT_EQ(read(std::map<std::string, std::string>{}), RVValue(RVDictionary{}));
}

TEST_F(AValue, ThatIsADictionaryWithOtherKeysCannotBeHandedOn) {
  EXPECT_EQ(errorOf(std::map<std::int32_t, std::string>{{1, "a"}}), kInvalidArgs);
  EXPECT_EQ(errorOf(std::map<sdbus::ObjectPath, std::string>{{sdbus::ObjectPath("/"), "a"}}), kInvalidArgs);
}

TEST_F(AValue, ThatIsAFileDescriptorCannotBeHandedOn) {
  EXPECT_EQ(errorOf(sdbus::UnixFd(0)), kInvalidArgs);
  EXPECT_EQ(errorOf(std::vector<sdbus::UnixFd>{sdbus::UnixFd(0)}), kInvalidArgs);
}

TEST_F(AValue, InAVariantIsWhatTheVariantHolds) {
  EXPECT_EQ(read(sdbus::Variant(sdbus::Variant(std::string("a")))), RVValue("a"));
  EXPECT_EQ(
      read(std::vector<sdbus::Variant>{sdbus::Variant(std::int32_t{1}), sdbus::Variant(std::string("a"))}),
      RVValue(RVArray{1, "a"}));
}

TEST_F(AValue, MayBeNestedSixteenDeepAndNoDeeper) {
  const auto nested = [](int levels) {
    sdbus::Variant variant(std::vector<std::string>{});
    for (int level = 1; level < levels; ++level)
      variant = sdbus::Variant(std::vector<sdbus::Variant>{variant});
    return variant;
  };
  EXPECT_NE(readVariantOf(nested(16)).array(), nullptr);
  EXPECT_THROW(readVariantOf(nested(17)), sdbus::Error);
}

TEST_F(AValue, OverTheSizeLimitIsRefused) {
  size_ = 100;
  EXPECT_EQ(errorOf(std::string(101, 'x')), kLimitsExceeded);
  EXPECT_EQ(errorOf(std::vector<std::uint8_t>(101)), kLimitsExceeded);
  EXPECT_EQ(errorOf(std::string(50, 'x')), "");
}

TEST_F(AValue, ComesBackFromTheBusAsItWent) {
  const RVValue value(RVDictionary{
      {"s", "text"}, {"i", 7}, {"d", 0.5}, {"b", true}, {"a", RVArray{"x", RVDictionary{{"k", RVArray{}}}}}});
  EXPECT_EQ(back(value), value);
}

TEST_F(AValue, IsMadeFitForTheBus) {
  EXPECT_EQ(busText("abc ü 日 😀"), "abc ü 日 😀");
  EXPECT_EQ(busText("a\xFFz"), "a\xEF\xBF\xBDz");
  EXPECT_EQ(busText(std::string_view("a\0z", 3)), "a\xEF\xBF\xBDz");
  EXPECT_EQ(busText("\xC0\x80"), "\xEF\xBF\xBD\xEF\xBF\xBD");
  EXPECT_EQ(busText("\xED\xA0\x80"), "\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD");
  EXPECT_EQ(busText("\xF4\x90\x80\x80"), "\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD");
  EXPECT_EQ(busText("\xE2\x82"), "\xEF\xBF\xBD\xEF\xBF\xBD");
}

class Options : public OnABus {
 protected:
  RVDictionary read(const std::map<std::string, sdbus::Variant>& entries, std::size_t size = 1 << 20) {
    auto message = makeMessage();
    message << entries << std::string("behind");
    message.seal();
    message.rewind(true);
    SizeLimit limit{size};
    auto options = readOptions(message, limit, {"app_id"});
    EXPECT_EQ(readString(message, limit), "behind");
    return options;
  }
};

TEST_F(Options, HoldTheKeysThatAreKnown) {
  EXPECT_EQ(read({{"app_id", sdbus::Variant(std::string("1"))}}), (RVDictionary{{"app_id", "1"}}));
  EXPECT_EQ(read({}), RVDictionary());
}

TEST_F(Options, OfOtherKeysAreDroppedWhateverTheyHold) {
  using Inner = std::map<std::int32_t, sdbus::Variant>;
  EXPECT_EQ(read({{"app_id", sdbus::Variant(std::string("1"))},
                  {"zero", sdbus::Variant(sdbus::UnixFd(0))},
                  {"one", sdbus::Variant(Inner{{1, sdbus::Variant(sdbus::make_struct(true, 0.5))}})},
                  {"two", sdbus::Variant(std::uint64_t{18446744073709551615U})},
                  {"three", sdbus::Variant(std::vector<sdbus::ObjectPath>{sdbus::ObjectPath("/")})}}),
            (RVDictionary{{"app_id", "1"}}));
}

TEST_F(Options, OfOtherKeysCountForTheSize) {
  EXPECT_THROW(read({{"other", sdbus::Variant(std::string(1000, 'x'))}}, 500), sdbus::Error);
}

}  // namespace
}  // namespace bus
