// Property lists: values, XML, files. The binary form has its own test file.
#include "platform/plist/property_list.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <cmath>
#include <limits>

#include "tests/unit/doubles/temporary_directory.h"

namespace lmx {
namespace {

using testing::TemporaryDirectory;
using testing::writeFile;

std::string document(const std::string& body) {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n" + body + "\n</plist>\n";
}
std::string repeated(const std::string& text, int times) {
  std::string out;
  for (int i = 0; i < times; ++i) out += text;
  return out;
}
std::string problemOf(const std::string& text) {
  const PlistResult result = parsePropertyList(text);
  return result ? "" : result.error().message;
}
std::optional<PlistValue> valueOf(const std::string& body) {
  return parsePropertyList(document(body)).value();
}

TEST(PlistValue, NumbersAndTextsConvert) {
  struct Case {
    PlistValue value;
    double real;
    std::int64_t integer;
    bool boolean;
  };
  const Case cases[] = {
      {std::int64_t{-7}, -7, -7, true},
      {std::int64_t{0}, 0, 0, false},
      {2.75, 2.75, 2, true},
      {0.25, 0.25, 0, true},
      {0.0, 0, 0, false},
      {true, 1, 1, true},
      {false, 0, 0, false},
      {"12.5", 12.5, 12, true},
      {"  42abc", 42, 42, true},
      {"0", 0, 0, false},
      {"", 0, 0, false},
      {"text", 0, 0, false},
      {"true", 0, 0, true},
      {"YES", 0, 0, true},
      {"no", 0, 0, false},
      {PlistArray{}, 0, 0, false},
      {PlistDictionary{}, 0, 0, false},
      {PlistDate{5}, 0, 0, false},
      {PlistValue::Data{1}, 0, 0, false},
      {1e300, 1e300, 0, true},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(c.value.asReal(), c.real);
    EXPECT_EQ(c.value.asInteger(), c.integer);
    EXPECT_EQ(c.value.asBool(), c.boolean);
  }
  EXPECT_EQ(PlistValue(std::nan("")).asInteger(), 0);
}

PlistDictionary everyKind() {
  return {
      {"text", "a & b <c> \"d\" 'e' \xC3\xA4 \xF0\x9F\x8E\xA5"},
      {"empty", ""},
      {"spaces", "  two lines\n\tand a tab  "},
      {"key with <&>", "x"},
      {"true", true},
      {"false", false},
      {"negative", std::int64_t{-5}},
      {"smallest", std::numeric_limits<std::int64_t>::min()},
      {"largest", std::numeric_limits<std::int64_t>::max()},
      {"tenth", 0.1},
      {"small", -1.5e-7},
      {"large", 1e300},
      {"date", PlistDate{750000000}},
      {"date before", PlistDate{-100}},
      {"data", PlistValue::Data{0, 1, 254, 255}},
      {"long data", PlistValue::Data(1000, 7)},
      {"array", PlistArray{"one", std::int64_t{2}, PlistArray{}, PlistDictionary{{"in", true}}}},
      {"dictionary", PlistDictionary{}},
  };
}

TEST(PropertyList, EveryKindOfValueRoundTripsThroughXml) {
  const PlistResult result = parsePropertyList(propertyListXml(everyKind()));
  ASSERT_TRUE(result) << result.error().message;
  for (const auto& [key, value] : everyKind()) EXPECT_EQ(result->dictionary()->at(key), value) << key;
  EXPECT_EQ(*result, PlistValue(everyKind()));
}

TEST(PropertyList, XmlIsCompleteAndEndsInALineFeed) {
  const std::string text = propertyListXml(PlistDictionary{{"a<", "b&"}, {"n", std::int64_t{-1}}});
  EXPECT_TRUE(text.starts_with("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!DOCTYPE plist "));
  EXPECT_NE(text.find("<dict>\n\t<key>a&lt;</key>\n\t<string>b&amp;</string>\n\t<key>n</key>\n"
                      "\t<integer>-1</integer>\n</dict>\n</plist>\n"),
            std::string::npos);
  EXPECT_TRUE(text.ends_with("</plist>\n"));
}

TEST(PropertyList, CharactersInvalidInXmlAreReplaced) {
  const std::string replacement = "\xEF\xBF\xBD";
  struct Case {
    std::string text;
    std::string stored;
  };
  const Case cases[] = {
      {"a\x01z", "a" + replacement + "z"},
      {std::string("a\0z", 3), "a" + replacement + "z"},
      {"a\xFFz", "a" + replacement + "z"},
      {"cut \xC3", "cut " + replacement},
      {"\xED\xA0\x80", replacement + replacement + replacement},
      {"\xC0\xAF", replacement + replacement},
      {"tab\tline\n", "tab\tline\n"},
  };
  for (const Case& c : cases)
    EXPECT_EQ(parsePropertyList(propertyListXml(c.text)).value(), PlistValue(c.stored));
}

TEST(PropertyList, DatesOutOfRangeAreClamped) {
  for (const double seconds : {1e18, -1e18, std::numeric_limits<double>::infinity(), std::nan("")}) {
    const auto value = parsePropertyList(propertyListXml(PlistDate{seconds})).value();
    ASSERT_TRUE(value);
    const double stored = std::get<PlistDate>(value->value).secondsSinceReferenceDate;
    EXPECT_EQ(std::signbit(stored), seconds < 0);
  }
}

TEST(PropertyList, ReadsDocumentsFromOtherWriters) {
  EXPECT_EQ(valueOf("<dict><key>a</key><true/><key>b</key><false></false></dict>"),
            PlistValue(PlistDictionary{{"a", true}, {"b", false}}));
  EXPECT_EQ(valueOf("<string>&lt;&amp;&gt;&quot;&apos;&#65;&#x42;</string>"), PlistValue("<&>\"'AB"));
  EXPECT_EQ(valueOf("<integer> -12 </integer>"), PlistValue(std::int64_t{-12}));
  EXPECT_EQ(valueOf("<real>1e3</real>"), PlistValue(1000.0));
  EXPECT_EQ(valueOf("<date>2001-01-02T00:00:01Z</date>"), PlistValue(PlistDate{86401}));
  EXPECT_EQ(valueOf("<data>\n\tAAEC\n\t/w==\n</data>"), PlistValue(PlistValue::Data{0, 1, 2, 255}));
  EXPECT_EQ(valueOf("<array />"), PlistValue(PlistArray{}));
  EXPECT_EQ(valueOf("<string/>"), PlistValue(""));
  EXPECT_EQ(parsePropertyList("<dict><key>bare</key><true/></dict>").value(),
            PlistValue(PlistDictionary{{"bare", true}}));
}

TEST(PropertyList, TagsInCommentsCdataAndAttributesAreNotCounted) {
  const std::string deep = repeated("<array>", 100);
  EXPECT_EQ(valueOf("<!-- " + deep + " --><string>a<!-- <dict> -->b</string>"), PlistValue("ab"));
  EXPECT_EQ(valueOf("<string><![CDATA[" + deep + " & ]]></string>"), PlistValue(deep + " & "));
  EXPECT_EQ(valueOf("<?php " + deep + " ?><true/>"), PlistValue(true));
  EXPECT_EQ(valueOf("<string note=\"<array>/>\" other='\">'>x</string>"), PlistValue("x"));
}

TEST(PropertyList, MarkupThatHidesDepthIsStillCounted) {
  // Parsers disagree about each of these.
  const std::string deep = repeated("<array>", 70) + repeated("</array>", 70);
  for (const std::string& hidden :
       {"<!-->" + deep + "<!-- -->", "<?>" + deep + "<? ?>", "<!--->" + deep + "<!-- -->"}) {
    EXPECT_EQ(valueOf(hidden + "<true/>"), PlistValue(true)) << hidden.substr(0, 8);
  }
}

TEST(PropertyList, SixtyFourLevelsAreTheLimit) {
  const auto nested = [](int levels) {
    return document(repeated("<array>", levels - 1) + "<true/>" + repeated("</array>", levels - 1));
  };
  EXPECT_EQ(problemOf(nested(64)), "");
  EXPECT_EQ(problemOf(nested(65)), "nested more than 64 levels");
  EXPECT_EQ(problemOf(nested(20000)), "nested more than 64 levels");
  EXPECT_EQ(problemOf(repeated("<plist>", 1000)), "a <plist> inside of the document");
}

TEST(PropertyList, TenThousandValuesAreTheLimit) {
  const auto wide = [](int values) {
    return document("<array>" + repeated("<true/>", values - 1) + "</array>");
  };
  EXPECT_EQ(problemOf(wide(10000)), "");
  EXPECT_EQ(problemOf(wide(10001)), "more than 10000 values");
  EXPECT_EQ(problemOf(document("<array>" + repeated("<string/>", 10000) + "</array>")),
            "more than 10000 values");
}

TEST(PropertyList, KeysAreNotCountedAsValues) {
  std::string body;
  for (int i = 0; i < 9999; ++i) body += "<key>" + std::to_string(i) + "</key><true/>";
  EXPECT_EQ(problemOf(document("<dict>" + body + "</dict>")), "");
}

TEST(PropertyList, DefinitionsAreRefused) {
  const std::string body = "<plist><string>&a;</string></plist>";
  EXPECT_EQ(problemOf("<!DOCTYPE plist [<!ENTITY a \"aaaa\">]>" + body), "a DOCTYPE with definitions");
  EXPECT_EQ(problemOf("<!DOCTYPE plist SYSTEM \"x\" [ ]>" + body), "a DOCTYPE with definitions");
  EXPECT_EQ(problemOf("<!ENTITY a \"aaaa\">" + body), "a definition");
  EXPECT_EQ(problemOf(body), "not a well-formed property list");
}

TEST(PropertyList, InvalidDocumentsAreRejectedWithAReason) {
  struct Case {
    std::string text;
    const char* problem;
  };
  const Case cases[] = {
      {"", "the file is empty"},
      {"\xEF\xBB\xBF", "the file is empty"},
      {"just text", "neither an XML nor a binary property list"},
      {"<html><body/></html>", "an unknown element <html>"},
      {"<plist><array><true/>", "<array> that does not end"},
      {"<plist><array></dict></plist>", "</dict> without its beginning"},
      {"<plist><true/></plist></plist>", "</plist> without its beginning"},
      {"<plist><string>a<true/></string></plist>", "an element inside of <string>"},
      {"<plist><true", "a tag that does not end"},
      {"<plist><true<array/></plist>", "a tag that does not end"},
      {"<plist><!-- ", "markup that does not end"},
      {"<plist><string><![CDATA[x", "markup that does not end"},
      {std::string("<plist><string>a\0b</string></plist>", 35), "a NUL character"},
      {"<plist></plist>", "not a well-formed property list"},
      {"<plist><dict><string>value without key</string></dict></plist>", "not a well-formed property list"},
      {"<plist><string>&unknown;</string></plist>", "not a well-formed property list"},
  };
  for (const Case& c : cases) EXPECT_EQ(problemOf(c.text), c.problem) << c.text;
}

TEST(PropertyList, CharacterReferencesAreResolved) {
  EXPECT_EQ(valueOf("<string>&#60;&#x26;amp;&#228;&#x20AC;&#x1F3A5;&#10;</string>"),
            PlistValue("<&amp;\xC3\xA4\xE2\x82\xAC\xF0\x9F\x8E\xA5\n"));
}

TEST(PropertyList, InvalidCharacterReferencesAreRejected) {
  for (const char* reference : {"&#0;", "&#x0;", "&#000;", "&#1;", "&#xD800;", "&#x110000;", "&#99999999999;",
                                "&#;", "&#x;", "&#-1;", "&#65", "&# 65;", "&#X41;", "&#0x41;"}) {
    const std::string text = document("<string>a" + std::string(reference) + "</string>");
    EXPECT_EQ(problemOf(text), "a reference to a character that is none") << reference;
  }
}

TEST(PropertyList, ByteOrderMarkIsSkipped) {
  EXPECT_EQ(parsePropertyList("\xEF\xBB\xBF" + document("<string>x</string>")).value(), PlistValue("x"));
}

TEST(PropertyList, TruncatedDocumentsAreRejected) {
  const std::string text = propertyListXml(everyKind());
  // Without its last tag, no document is complete.
  for (std::size_t length = 0; length < text.rfind("</plist>"); ++length) {
    EXPECT_FALSE(parsePropertyList(text.substr(0, length)).value()) << length;
  }
}

TEST(PropertyListFile, WrittenAndReadAgain) {
  const TemporaryDirectory directory;
  const std::string path = directory.file("a.plist");
  EXPECT_EQ(writePropertyList(path, everyKind(), 0600), 0);
  struct stat status {};
  ASSERT_EQ(stat(path.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0600U);
  EXPECT_EQ(readPropertyList(path).value(), PlistValue(everyKind()));
}

TEST(PropertyListFile, WriteFailureIsReported) {
  const TemporaryDirectory directory;
  EXPECT_EQ(writePropertyList(directory.file("none/a.plist"), everyKind()), ENOENT);
}

TEST(PropertyListFile, MissingFileReportsItsErrno) {
  const TemporaryDirectory directory;
  const PlistResult result = readPropertyList(directory.file("none"));
  EXPECT_FALSE(result.value());
  EXPECT_EQ(result.error().systemError, ENOENT);
  EXPECT_EQ(result.error().message, "No such file or directory");
}

TEST(PropertyListFile, BrokenFileReportsNoErrno) {
  const TemporaryDirectory directory;
  writeFile(directory.file("broken"), "text");
  const PlistResult result = readPropertyList(directory.file("broken"));
  EXPECT_EQ(result.error().systemError, 0);
  EXPECT_EQ(result.error().message, "neither an XML nor a binary property list");
}

TEST(PropertyListFile, SizeIsLimited) {
  const TemporaryDirectory directory;
  const std::string text = document("<string>" + std::string(1000, 'x') + "</string>");
  writeFile(directory.file("f"), text);
  EXPECT_TRUE(readPropertyList(directory.file("f"), {.bytes = text.size()}).value());
  const PlistResult result = readPropertyList(directory.file("f"), {.bytes = text.size() - 1});
  EXPECT_FALSE(result.value());
  EXPECT_EQ(result.error().message, "larger than " + std::to_string(text.size() - 1) + " bytes");
  writeFile(directory.file("g"), document("<string>" + std::string(kPlistFileLimit, 'x') + "</string>"));
  EXPECT_EQ(readPropertyList(directory.file("g")).error().message, "larger than 262144 bytes");
}

TEST(PropertyListFile, OnlyRegularFilesAreRead) {
  const TemporaryDirectory directory;
  ASSERT_EQ(mkfifo(directory.file("fifo").c_str(), 0600), 0);
  EXPECT_EQ(readPropertyList(directory.file("fifo")).error().message, "not a regular file");
  EXPECT_EQ(readPropertyList("/dev/zero").error().message, "not a regular file");
  EXPECT_EQ(readPropertyList(directory.path()).error().systemError, EISDIR);
}

}  // namespace
}  // namespace lmx
