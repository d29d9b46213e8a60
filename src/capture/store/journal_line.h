// Lines of a capture's journal: words separated by blanks, escaped so that a word can hold any text. Pure.
#pragma once
#include <string>
#include <vector>

namespace lmx {

using JournalWords = std::vector<std::string>;

/// `words` as one line, with its line break. Blanks, control characters and "%" become "%XX"; an empty word
/// becomes "%".
std::string journalLine(const JournalWords& words);

/// The words of a line without its line break.
JournalWords journalWords(const std::string& line);

}  // namespace lmx
