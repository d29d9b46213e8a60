// Escapes and splits the words of journal lines.
#include "capture/store/journal_line.h"

#include <cctype>
#include <cstdlib>
#include <sstream>

#include "support/format.h"

namespace lmx {
namespace {

std::string escaped(const std::string& word) {
  std::string out;
  for (const char c : word) {
    const auto u = static_cast<unsigned char>(c);
    if (u <= ' ' || c == '%' || u == 0x7F) {
      out += string_with_format("%%%02X", u);
    } else {
      out += c;
    }
  }
  return out.empty() ? "%" : out;  // an empty word must still be a word
}

std::string unescaped(const std::string& word) {
  if (word == "%") return {};
  std::string out;
  for (std::size_t i = 0; i < word.size(); ++i) {
    if (word[i] == '%' && i + 2 < word.size() &&
        std::isxdigit(static_cast<unsigned char>(word[i + 1])) != 0) {
      out += static_cast<char>(std::strtol(word.substr(i + 1, 2).c_str(), nullptr, 16));
      i += 2;
    } else {
      out += word[i];
    }
  }
  return out;
}

}  // namespace

std::string journalLine(const JournalWords& words) {
  std::string line;
  for (const std::string& word : words) {
    if (!line.empty()) line += ' ';
    line += escaped(word);
  }
  line += '\n';
  return line;
}

JournalWords journalWords(const std::string& line) {
  JournalWords words;
  std::istringstream in(line);
  for (std::string word; in >> word;) words.push_back(unescaped(word));
  return words;
}

}  // namespace lmx
