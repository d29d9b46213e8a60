// How a command's text becomes a verb and parameters, and the text rules around it.
#include "control/protocol/command_parser.h"

#include <gtest/gtest.h>

#include <limits>

#include "control/protocol/command_text.h"

namespace lmx {
namespace {

struct ParserCase {
  const char* name;
  const char* text;
  Command expected;
};

class CommandParser : public ::testing::TestWithParam<ParserCase> {};

TEST_P(CommandParser, Splits) { EXPECT_EQ(parseCommand(GetParam().text), GetParam().expected); }

INSTANTIATE_TEST_SUITE_P(
    Table, CommandParser,
    ::testing::Values(
        ParserCase{"VerbAloneHasNoParameters", "STATUS", {"STATUS", std::nullopt}},
        ParserCase{"EmptyTextIsAnEmptyVerb", "", {"", std::nullopt}},
        ParserCase{"BlankBehindTheVerbGivesAnEmptyDictionary", "STATUS ", {"STATUS", Dictionary{}}},
        ParserCase{"LeadingBlankGivesAnEmptyVerb", " STATUS", {"", Dictionary{}}},
        ParserCase{"OnlyPiecesWithOneEqualsAreKept", "X a=1,b=x=y,c", {"X", Dictionary{{"a", "1"}}}},
        ParserCase{"DigestRunsToTheEndOfTheLine",
                   "USERAUTH user=bob,digest=a,b=c",
                   {"USERAUTH", Dictionary{{"user", "bob"}, {"digest", "a,b=c"}}}},
        ParserCase{"DigestIsTakenFromItsFirstOccurrenceInTheText",
                   "USERAUTH xdigest=1,digest=2",
                   {"USERAUTH", Dictionary{{"xdigest", "1"}, {"digest", "1,digest=2"}}}},
        ParserCase{"DigestWithoutAValueIsIgnored",
                   "USERAUTH digest,user=bob",
                   {"USERAUTH", Dictionary{{"user", "bob"}}}},
        ParserCase{"EmptyDigestIsKept", "USERAUTH digest=", {"USERAUTH", Dictionary{{"digest", ""}}}},
        ParserCase{"DigestInCapitalsIsAnOrdinaryKey",
                   "USERAUTH Digest=a,b=c",
                   {"USERAUTH", Dictionary{{"Digest", "a"}, {"b", "c"}}}},
        ParserCase{"BlankInsideAValueSurvives",
                   "START title=My Talk,x=1",
                   {"START", Dictionary{{"title", "My Talk"}, {"x", "1"}}}},
        ParserCase{"RunOfBlanksInsideAValueSurvives",
                   "START title=My   Talk",
                   {"START", Dictionary{{"title", "My   Talk"}}}},
        ParserCase{"EmptyKeyAndEmptyValueAreAccepted", "X =,a=", {"X", Dictionary{{"", ""}, {"a", ""}}}},
        ParserCase{"LaterDuplicateReplaces", "X a=1,a=2", {"X", Dictionary{{"a", "2"}}}},
        ParserCase{"KeysDifferByCase", "X a=1,A=2", {"X", Dictionary{{"a", "1"}, {"A", "2"}}}},
        ParserCase{
            "LineBreaksAroundAValueAreTrimmed", "X a=\r1\n,b=2", {"X", Dictionary{{"a", "1"}, {"b", "2"}}}},
        ParserCase{"CommasAloneGiveAnEmptyDictionary", "X ,,,", {"X", Dictionary{}}}),
    [](const auto& test) { return std::string(test.param.name); });

TEST(CommandText, LineBreaksAreTrimmedAtBothEndsOnly) {
  EXPECT_EQ(trimLineBreaks("\r\n\v\fSTATUS\u0085\u2028\u2029\r\n"), "STATUS");
  EXPECT_EQ(trimLineBreaks("A\nB"), "A\nB");
  EXPECT_EQ(trimLineBreaks(" A "), " A ");
  EXPECT_EQ(trimLineBreaks("\n\r\n"), "");
}

TEST(CommandText, DecimalValueStopsAtTheFirstOtherCharacterAndAtTheLimits) {
  EXPECT_EQ(decimalValue("2"), 2);
  EXPECT_EQ(decimalValue(" 17minutes"), 17);
  EXPECT_EQ(decimalValue("-3"), -3);
  EXPECT_EQ(decimalValue("x"), 0);
  EXPECT_EQ(decimalValue(""), 0);
  EXPECT_EQ(decimalValue("99999999999999999999"), std::numeric_limits<std::int32_t>::max());
  EXPECT_EQ(decimalValue("-99999999999"), std::numeric_limits<std::int32_t>::min());
}

TEST(CommandText, PasswordsAreStarsInTheLog) {
  EXPECT_EQ(withoutSecrets("START a=1,RecordingMetadata_AGENT_PASSWORD=open sesame=,b=2"),
            "START a=1,RecordingMetadata_AGENT_PASSWORD=****,b=2");
  EXPECT_EQ(withoutSecrets("START RecordingMetadata_AGENT_PASSWORD=a,RecordingMetadata_AGENT_PASSWORD=b"),
            "START RecordingMetadata_AGENT_PASSWORD=****,RecordingMetadata_AGENT_PASSWORD=****");
  EXPECT_EQ(withoutSecrets("START a=1"), "START a=1");
}

}  // namespace
}  // namespace lmx
