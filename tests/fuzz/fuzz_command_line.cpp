// Feeds arbitrary bytes, in chunks of arbitrary sizes, through line assembly and command parsing.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "control/protocol/command_parser.h"
#include "control/protocol/command_text.h"
#include "control/protocol/line_assembler.h"
#include "support/scan.h"
#include "support/utf8.h"

namespace {

void require(bool holds) {
  if (!holds) std::abort();
}

/// What a channel does with one line.
void execute(std::string_view line) {
  const std::string_view text = lmx::trimLineBreaks(line);
  const lmx::Command command = lmx::parseCommand(text);
  require(command.verb.find(' ') == std::string::npos);
  require(command.parameters.has_value() == (text.find(' ') != std::string_view::npos));
  if (command.parameters) {
    for (const auto& [key, value] : *command.parameters) {
      require(key.find_first_of(",=") == std::string::npos);
      require(key == "digest" || value.find(',') == std::string::npos);
      (void)lmx::decimalValue(value);
    }
  }
  (void)lmx::withoutSecrets(text);
  (void)lmx::isUtf8(text);
}

}  // namespace

/// The first byte of each chunk is its size; a small limit lets short inputs reach it.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  constexpr std::size_t kLimit = 64;
  lmx::LineAssembler assembler(kLimit);
  for (std::string_view input(reinterpret_cast<const char*>(data), size); !input.empty();) {
    const std::size_t length = static_cast<unsigned char>(input.front());
    input.remove_prefix(1);
    const std::string_view chunk = input.substr(0, length);
    input.remove_prefix(chunk.size());
    const auto result = assembler.feed(chunk);
    require(assembler.partialCommand().value_or("").size() <= kLimit);
    require(!result.line || result.line->size() <= kLimit + 1);
    if (result.line) execute(*result.line);
  }
  return 0;
}
