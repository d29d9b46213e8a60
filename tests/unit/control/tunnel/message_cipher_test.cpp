// The tunnel's cipher against answers of the openssl command, and everything that is not one of its messages.
#include "control/tunnel/message_cipher.h"

#include <gtest/gtest.h>

#include <random>
#include <string>

#include "support/base64.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

constexpr const char* kFailed = "Internal error occurred during decryption";

class MessageCipher : public ::testing::Test {
 protected:
  MessageCipher() {
    for (unsigned i = 0; i < 16; ++i) {
      key_[i] = static_cast<unsigned char>(i);
      vector_[i] = static_cast<unsigned char>(0x10 + i);
    }
    for (int i = 0; i < 32; ++i) prefix_ += static_cast<char>(i);
  }
  std::string encrypt(const std::string& plaintext) {
    const auto text = agent_encrypt_message(vector_, key_, plaintext);
    EXPECT_TRUE(text);
    return text.value_or("");
  }
  /// @return the plaintext; "(none)" on failure
  std::string decrypt(const std::string& text) {
    return agent_decrypt_message(vector_, key_, text).value_or("(none)");
  }
  CipherBlock key_{};
  CipherBlock vector_{};
  std::string prefix_;
  testing::LogCapture log_;
};

TEST_F(MessageCipher, GivesTheAnswersOfAnotherImplementation) {
  const std::pair<const char*, const char*> kKnown[] = {
      {"", "lU9k8uTobp7ugtICFmhImak7ndsi6KsQTGHnKIMdbVq5kd/tmhOBTaNJ/QCHzZgN"},
      {"cmdStatus=0", "lU9k8uTobp7ugtICFmhImak7ndsi6KsQTGHnKIMdbVr9nLt8tAOCiPLLBejXMPtI"},
      {"exactly16bytes!!",
       "lU9k8uTobp7ugtICFmhImak7ndsi6KsQTGHnKIMdbVpX8v4Iw1N+rM3FWmqEp7Z9mn19eFQkPOulKt3OIB5YTA=="}};
  for (const auto& [text, ciphertext] : kKnown) {
    EXPECT_EQ(encrypt(prefix_ + text), ciphertext);
    EXPECT_EQ(decrypt(ciphertext), prefix_ + text);
  }
}

TEST_F(MessageCipher, LongTextsHaveNoLineBreaks) {
  const std::string text(100000, 'x');
  const std::string line = encrypt(text);
  EXPECT_EQ(line.find('\n'), std::string::npos);
  EXPECT_EQ(decrypt(line), text);
}

TEST_F(MessageCipher, ALineFeedAtTheEndIsSkipped) {
  const std::string line = encrypt(prefix_ + "STOP");
  EXPECT_EQ(decrypt(line + "\n"), prefix_ + "STOP");
  EXPECT_EQ(decrypt(line + "\r\n"), prefix_ + "STOP");
}

TEST_F(MessageCipher, WhatIsNoMessageIsRefusedWithALine) {
  const std::string good = encrypt(prefix_ + "STOP");
  const std::string bad_padding = encrypt(prefix_).substr(0, 40) + "====";
  for (const std::string& text :
       {std::string("no base64!"), std::string("QUJD"), std::string(), good.substr(4), good.substr(0, 20),
        std::string("AAAAAAAAAAAAAAAAAAAAAA=="), bad_padding, std::string("ERR Unbound agent")}) {
    const auto before = log_.count(kLogCritical, kFailed);
    EXPECT_EQ(decrypt(text), "(none)") << text;
    EXPECT_EQ(log_.count(kLogCritical, kFailed), before + 1) << text;
  }
}

TEST(MessageIn, IsWhatStandsBehindTheRandomPrefix) {
  const std::string prefix(kRandomPrefix, 'r');
  EXPECT_EQ(messageIn(prefix + "STOP"), "STOP");
  EXPECT_EQ(messageIn(prefix + std::string("ST\0OP", 5)), "ST");
  EXPECT_EQ(messageIn(prefix), "");
  EXPECT_EQ(messageIn("short"), "");
}

TEST_F(MessageCipher, AnyNoiseIsSurvived) {
  std::mt19937 random(7);  // NOLINT: the same numbers every time
  for (int round = 0; round < 2000; ++round) {
    std::string bytes(random() % 200, '\0');
    for (char& c : bytes) c = static_cast<char>(random());
    decrypt(lmp_encode_base64(bytes));
    decrypt(bytes);
  }
}

TEST(RandomBytes, AreNotTheSameTwice) {
  EXPECT_NE(agent_random_bytes(32), agent_random_bytes(32));
  EXPECT_EQ(agent_random_bytes(32).size(), 32U);
  EXPECT_EQ(agent_random_bytes(0), "");
}

}  // namespace
}  // namespace lmx
