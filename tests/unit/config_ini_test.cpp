#include <gtest/gtest.h>

#include <random>

#include "daemon/config/IniFile.h"

namespace {

using config::IniFile;
using config::IniFlavour;
using config::parseIni;

std::string faultOf(std::string_view text) {
  const auto file = parseIni(text, "f", IniFlavour::kSettings);
  return file ? "none" : file.failure().message;
}

TEST(ASettingsText, HasItsSectionsAndEntriesWithTheirLines) {
  const auto file = parseIni("# comment\n\n[One]\nkey = a value \n; comment\nother=\n[Two]\r\nkey=x=y\r\n",
                             "f",
                             IniFlavour::kSettings);
  ASSERT_TRUE(file);
  ASSERT_EQ(file->sections.size(), 2u);
  EXPECT_EQ(file->sections[0].name, "One");
  EXPECT_EQ(file->sections[0].line, 3);
  ASSERT_EQ(file->sections[0].entries.size(), 2u);
  EXPECT_EQ(file->sections[0].entries[0].key, "key");
  EXPECT_EQ(file->sections[0].entries[0].value, "a value");
  EXPECT_EQ(file->sections[0].entries[0].line, 4);
  EXPECT_EQ(*file->sections[0].value("other"), "");
  EXPECT_EQ(*file->section("Two")->value("key"), "x=y");
  EXPECT_EQ(file->section("Two")->value("none"), nullptr);
  EXPECT_EQ(file->section("Three"), nullptr);
}

TEST(ASettingsText, IsRefusedForEveryFaultByItsLine) {
  EXPECT_EQ(faultOf("[A]\nno entry\n"), "f:2: a line is written key=value");
  EXPECT_EQ(faultOf("[A]\n=x\n"), "f:2: a line is written key=value");
  EXPECT_EQ(faultOf("\n[A\n"), "f:2: a section is written [name]");
  EXPECT_EQ(faultOf("[]"), "f:1: a section is written [name]");
  EXPECT_EQ(faultOf("["), "f:1: a section is written [name]");
  EXPECT_EQ(faultOf("[A]\n[B]\n[A]\n"), "f:3: section [A] stands there twice");
  EXPECT_EQ(faultOf("[A]\nk=1\nk=2\n"), "f:3: key \"k\" stands there twice");
  EXPECT_EQ(faultOf("k=1\n"), "f:1: key \"k\" stands in no section");
  EXPECT_EQ(faultOf("[A]\nk=\xff\n"), "f: is no UTF-8 text");
  EXPECT_EQ(faultOf(std::string_view("[A]\nk=\0\n", 9)), "f: is no UTF-8 text");
}

TEST(ASettingsText, MayBeEmpty) {
  EXPECT_EQ(faultOf(""), "none");
}

TEST(ADesktopEntry, HasLocalizedEntries) {
  const auto file = parseIni(
      "[Desktop Entry]\nName=Photos\nName[de]=Fotos\nName[de_AT]=Bülder\n", "f", IniFlavour::kDesktopEntry);
  ASSERT_TRUE(file);
  const config::IniSection& entry = *file->section("Desktop Entry");
  EXPECT_EQ(*entry.value("Name"), "Photos");
  EXPECT_EQ(*entry.value("Name", {"de_AT", "de"}), "Bülder");
  EXPECT_EQ(*entry.value("Name", {"de_CH", "de"}), "Fotos");
  EXPECT_EQ(*entry.value("Name", {"fr"}), "Photos");
}

TEST(ADesktopEntry, HasEscapesInItsValues) {
  const auto file = parseIni("[D]\nk=\\sa\\tb\\nc\\\\nd\\q\\\n", "f", IniFlavour::kDesktopEntry);
  ASSERT_TRUE(file);
  EXPECT_EQ(*file->sections[0].value("k"), " a\tb\nc\\nd\\q\\");
}

TEST(ADesktopEntry, IsReadInSpiteOfLinesThatMeanNothing) {
  const auto file = parseIni(
      "x\nk=0\n[D]\nnothing\n;k=1\nk=2\nk=3\n[]\nk=4\n[D]\nother=5\n", "f", IniFlavour::kDesktopEntry);
  ASSERT_TRUE(file);
  ASSERT_EQ(file->sections.size(), 1u);
  EXPECT_EQ(*file->sections[0].value("k"), "2");
  EXPECT_EQ(file->sections[0].value("other"), nullptr);
}

TEST(AnyText, IsReadOrRefusedWithoutHarm) {
  const auto seed = std::random_device{}();
  SCOPED_TRACE("seed " + std::to_string(seed));
  std::mt19937 random(seed);
  constexpr std::string_view kLetters = "[]=#;\\\n\n\r ab\t\xc3\xbc";
  for (int round = 0; round < 20000; ++round) {
    std::string text;
    while (random() % 40 != 0) text += kLetters[random() % kLetters.size()];
    EXPECT_TRUE(parseIni(text, "f", IniFlavour::kDesktopEntry));
    const auto strict = parseIni(text, "f", IniFlavour::kSettings);
    if (!strict) {
      EXPECT_TRUE(strict.failure().message.starts_with("f:"));
    }
  }
}

}  // namespace
