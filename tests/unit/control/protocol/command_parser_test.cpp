// How a command's text becomes a verb and parameters.
#include "control/protocol/command_parser.h"

#include <gtest/gtest.h>

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

}  // namespace
}  // namespace lmx
