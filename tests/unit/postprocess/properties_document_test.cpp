// The properties document's text and its file.
#include "postprocess/properties_document.h"

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <pugixml.hpp>

#include "tests/unit/postprocess/submit_fixture.h"

namespace lmx {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Entry = testing::LogCapture::Entry;

class PropertiesDocument : public testing::SubmitFixture {
 protected:
  std::string documentOf(Dictionary properties) {
    job_.properties = std::move(properties);
    return propertiesXml(job_.properties);
  }
  /// The properties that a reader finds in the document.
  static Dictionary parsed(const std::string& document) {
    pugi::xml_document xml;
    const auto result = xml.load_buffer(document.data(), document.size(),
                                        pugi::parse_default | pugi::parse_pi | pugi::parse_declaration);
    EXPECT_TRUE(result) << result.description();
    Dictionary found;
    const auto list = xml.child("LumexServerAgentRecordingProperties").child("RecordingProperties");
    for (const auto& element : list.children("RecordingProperty"))
      found[element.attribute("key").value()] = element.attribute("value").value();
    return found;
  }

  AgentSubmit job_;
};

TEST_F(PropertiesDocument, WithoutPropertiesHasAnEmptyList) {
  EXPECT_EQ(documentOf({}),
            "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
            "<LumexServerAgentRecordingProperties>\n"
            "    <RecordingProperties />\n"
            "</LumexServerAgentRecordingProperties>\n");
}

TEST_F(PropertiesDocument, HasOneElementPerProperty) {
  EXPECT_EQ(documentOf({{"RecordingMetadata_DURATION", "60"}, {"RecordingMetadata_TITLE", ""}}),
            "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
            "<LumexServerAgentRecordingProperties>\n"
            "    <RecordingProperties>\n"
            "        <RecordingProperty key=\"RecordingMetadata_DURATION\" value=\"60\" />\n"
            "        <RecordingProperty key=\"RecordingMetadata_TITLE\" value=\"\" />\n"
            "    </RecordingProperties>\n"
            "</LumexServerAgentRecordingProperties>\n");
}

struct Text {
  const char* name;
  std::string text;
  std::string read;  ///< what the document's reader gets
};
class SpecialText : public PropertiesDocument, public ::testing::WithParamInterface<Text> {};

TEST_P(SpecialText, IsReadBack) {
  EXPECT_EQ(parsed(documentOf({{"key", GetParam().text}})), (Dictionary{{"key", GetParam().read}}));
  EXPECT_EQ(parsed(documentOf({{"key " + GetParam().text, "value"}})),
            (Dictionary{{"key " + GetParam().read, "value"}}));
}

Text same(const char* name, const std::string& text) { return {name, text, text}; }

INSTANTIATE_TEST_SUITE_P(
    All, SpecialText,
    ::testing::Values(same("Markup", "<a href=\"x\">&amp; ]]> <!-- 'b' -->"),
                      same("Ampersands", "a & b &lt; c &#65;"), same("Umlauts", "Hörsaal 3 – Größe"),
                      same("OtherScripts", "光学 оптика بصريات"), same("BeyondTheBasicPlane", "🎥 \U0010FFFD"),
                      same("LineFeedsAndTabs", "a\nb\tc\r\nd\re"), same("BlanksAtTheEnds", "  a  b  "),
                      same("DeleteAndC1", "a\x7F\xC2\x80"), same("LastBeforeSurrogates", "\xED\x9F\xBF"),
                      same("FirstAfterSurrogates", "\xEE\x80\x80"), same("Long", std::string(100000, 'x')),
                      Text{"ControlCharacters",
                           "a\x01"
                           "b\x1B[31mc\x1F",
                           "a?b?[31mc?"},
                      Text{"Nul", std::string("a\0b", 3), "a?b"},
                      Text{"StrayContinuation",
                           "a\x80"
                           "b",
                           "a?b"},
                      Text{"Latin1",
                           "Gr\xF6\xDF"
                           "e",
                           "Gr??e"},
                      Text{"CutShort", "a\xE2\x82", "a??"},
                      Text{"CutShortByAnother",
                           "\xE2\x82"
                           "A",
                           "??A"},
                      Text{"Overlong",
                           "\xC0\xAF"
                           "\xE0\x80\xAF"
                           "\xF0\x80\x80\xAF",
                           "?????????"},
                      Text{"Surrogate", "\xED\xA0\x80", "???"},
                      Text{"NotACharacter",
                           "\xEF\xBF\xBE"
                           "\xEF\xBF\xBF",
                           "??????"},
                      Text{"BeyondUnicode",
                           "\xF4\x90\x80\x80"
                           "\xFF",
                           "?????"}),
    [](const auto& instance) { return instance.param.name; });

TEST_F(PropertiesDocument, IsWrittenUnderItsName) {
  job_.agentContext = context_;
  job_.properties = {{"RecordingMetadata_TITLE", "Optik & Größe"}};
  job_.properties_file_path = inRepository("ABC.xml");
  EXPECT_EQ(job_.writeProperties(), 0);
  EXPECT_EQ(contentOf(inRepository("ABC.xml")), propertiesXml(job_.properties));
  EXPECT_EQ(modeOf(inRepository("ABC.xml")), std::filesystem::perms{0600}) << "it may hold a password";
  EXPECT_EQ(filesInRepository(), 1U);
  EXPECT_THAT(log_.entries(), IsEmpty());
}

TEST_F(PropertiesDocument, ReplacesAnOlderDocumentAtomically) {
  write(inRepository("ABC.xml"), std::string(10000, 'x'));
  std::filesystem::permissions(inRepository("ABC.xml"), std::filesystem::perms{0644});
  struct stat before {};
  ASSERT_EQ(stat(inRepository("ABC.xml").c_str(), &before), 0);
  job_.properties_file_path = inRepository("ABC.xml");
  EXPECT_EQ(job_.writeProperties(), 0);
  struct stat after {};
  ASSERT_EQ(stat(inRepository("ABC.xml").c_str(), &after), 0);
  EXPECT_NE(before.st_ino, after.st_ino);
  EXPECT_EQ(after.st_mode & 07777, 0600U);
  EXPECT_EQ(contentOf(inRepository("ABC.xml")), propertiesXml(job_.properties));
}

TEST_F(PropertiesDocument, AFailedWriteIsAWarningAndNoFailure) {
  job_.agentContext = context_;
  job_.properties_file_path = inRepository("missing/ABC.xml");
  EXPECT_EQ(job_.writeProperties(), 0);
  EXPECT_THAT(log_.entries(),
              ElementsAre(Entry{kLogWarning, "The properties document \"" + inRepository("missing/ABC.xml") +
                                                 "\" could not be written: No such file or directory"}));
}

TEST_F(PropertiesDocument, WithoutAPathNothingIsWritten) {
  EXPECT_EQ(job_.writeProperties(), 0);
  EXPECT_EQ(filesInRepository(), 0U);
}

}  // namespace
}  // namespace lmx
