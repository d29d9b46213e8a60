// Which parameters a START may have.
#include "control/handlers/start_parameters.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

Dictionary parametersWith(const std::string& identifier) {
  return {{"RecordingMetadata_RECORDING_UUID", identifier},
          {"RecordingMetadata_MAX_RECORDING_MINUTES", "50"},
          {"RecordingMetadata_UNATTENDED_RECORDING_MINUTES", "20"}};
}

StartCheck checkIdentifier(const std::string& identifier) {
  const Dictionary parameters = parametersWith(identifier);
  return checkStart(&parameters);
}

StartCheck checkPath(const std::string& path) {
  Dictionary parameters = parametersWith("R1");
  parameters["RecordingMetadata_ADHOC_FILE_PATH"] = path;
  return checkStart(&parameters);
}

TEST(StartParameters, ThreeAreRequired) {
  EXPECT_FALSE(checkStart(nullptr).accepted);
  for (const auto& [key, value] : parametersWith("R1")) {
    Dictionary parameters = parametersWith("R1");
    parameters.erase(key);
    EXPECT_FALSE(checkStart(&parameters).accepted) << key;
    EXPECT_EQ(checkStart(&parameters).problem, "") << "the reply says enough";
  }
}

TEST(StartParameters, AnIdentifierThatCanNameAFileIsAccepted) {
  for (const std::string& identifier :
       {std::string("R1"), std::string("..."), std::string("Größe der Häuser"), std::string("a.b c"),
        std::string(200, 'x')}) {
    EXPECT_TRUE(checkIdentifier(identifier).accepted) << identifier;
    EXPECT_EQ(checkIdentifier(identifier).problem, "");
  }
}

TEST(StartParameters, AnIdentifierThatCanNotIsRefusedWithTheReason) {
  for (const std::string& identifier : {std::string(), std::string("a/b"), std::string("."),
                                        std::string(".."), std::string(201, 'x'), std::string(300, 'x')}) {
    const StartCheck check = checkIdentifier(identifier);
    EXPECT_FALSE(check.accepted) << identifier;
    EXPECT_EQ(check.problem.find("RecordingMetadata_RECORDING_UUID names the movie and must not "), 0U)
        << check.problem;
  }
}

TEST(StartParameters, APathThatCanBeAFileIsAccepted) {
  for (const char* path : {"/tmp/a.mov", "/tmp/Hörsaal 3.mov", "out.mov", "/x"})
    EXPECT_TRUE(checkPath(path).accepted) << path;
}

TEST(StartParameters, APathThatCanNotIsRefusedWithTheReason) {
  std::string deep;
  for (int i = 0; i < 60; ++i) deep += "/" + std::string(100, 'd');
  for (const std::string& path : {std::string(), std::string("/tmp/"), "/tmp/" + std::string(201, 'x'),
                                  "/" + std::string(256, 'd') + "/a.mov", deep + "/a.mov"}) {
    const StartCheck check = checkPath(path);
    EXPECT_FALSE(check.accepted) << path;
    EXPECT_EQ(check.problem.find("RecordingMetadata_ADHOC_FILE_PATH "), 0U) << check.problem;
  }
}

}  // namespace
}  // namespace lmx
