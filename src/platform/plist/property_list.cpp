// Reads and writes property lists with libplist.
#include "platform/plist/property_list.h"

#include <fcntl.h>
#include <plist/plist.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <memory>
#include <string_view>
#include <utility>

#include "platform/directories.h"
#include "platform/plist/property_list_guard.h"
#include "platform/plist/property_list_xml.h"
#include "support/unique_fd.h"
#include "support/utf8.h"

namespace lmx {
namespace {

struct PlistFree {
  void operator()(void* node) const { plist_free(node); }
};
using Node = std::unique_ptr<void, PlistFree>;

std::string takeText(char* text) {
  const std::unique_ptr<char, decltype(&std::free)> owner(text, &std::free);
  return text == nullptr ? std::string() : std::string(text);
}

PlistValue valueFrom(plist_t node);

PlistValue dictionaryFrom(plist_t node) {
  PlistDictionary dictionary;
  plist_dict_iter iterator = nullptr;
  plist_dict_new_iter(node, &iterator);
  const std::unique_ptr<void, decltype(&std::free)> owner(iterator, &std::free);
  for (;;) {
    char* key = nullptr;
    plist_t child = nullptr;
    plist_dict_next_item(node, iterator, &key, &child);
    if (key == nullptr) break;
    dictionary[takeText(key)] = valueFrom(child);
  }
  return dictionary;
}

PlistValue arrayFrom(plist_t node) {
  PlistArray array;
  for (std::uint32_t i = 0; i < plist_array_get_size(node); ++i)
    array.push_back(valueFrom(plist_array_get_item(node, i)));
  return array;
}

PlistValue dataFrom(plist_t node) {
  char* bytes = nullptr;
  std::uint64_t length = 0;
  plist_get_data_val(node, &bytes, &length);
  const std::unique_ptr<char, decltype(&std::free)> owner(bytes, &std::free);
  return bytes == nullptr ? PlistValue::Data{} : PlistValue::Data(bytes, bytes + length);
}

PlistValue scalarFrom(plist_t node) {
  switch (plist_get_node_type(node)) {
    case PLIST_BOOLEAN: {
      std::uint8_t v = 0;
      plist_get_bool_val(node, &v);
      return v != 0;
    }
    case PLIST_UINT: {
      std::uint64_t v = 0;
      plist_get_uint_val(node, &v);
      return static_cast<std::int64_t>(v);
    }
    case PLIST_REAL: {
      double v = 0;
      plist_get_real_val(node, &v);
      return v;
    }
    case PLIST_DATE: {
      std::int32_t seconds = 0;
      std::int32_t microseconds = 0;
      plist_get_date_val(node, &seconds, &microseconds);
      return PlistDate{static_cast<double>(seconds)};
    }
    default: {
      char* text = nullptr;
      plist_get_string_val(node, &text);
      return takeText(text);
    }
  }
}

PlistValue valueFrom(plist_t node) {
  switch (plist_get_node_type(node)) {
    case PLIST_DICT:
      return dictionaryFrom(node);
    case PLIST_ARRAY:
      return arrayFrom(node);
    case PLIST_DATA:
      return dataFrom(node);
    default:
      return scalarFrom(node);
  }
}

template <class... Ts>
struct Overloaded : Ts... {
  using Ts::operator()...;
};
template <class... Ts>
Overloaded(Ts...) -> Overloaded<Ts...>;

/// libplist's seconds are 32 bits wide. Dates outside 1932 … 2069 are clamped.
std::int32_t dateSeconds(const PlistDate& date) {
  if (std::isnan(date.secondsSinceReferenceDate)) return 0;
  constexpr double kLimit = std::numeric_limits<std::int32_t>::max();
  return static_cast<std::int32_t>(std::clamp(std::floor(date.secondsSinceReferenceDate), -kLimit, kLimit));
}

plist_t newNode(const PlistValue& value) {
  return std::visit(
      Overloaded{
          [](const std::string& v) { return plist_new_string(xmlText(v, kReplacementCharacter).c_str()); },
          [](bool v) { return plist_new_bool(v ? 1 : 0); },
          [](std::int64_t v) { return plist_new_uint(static_cast<std::uint64_t>(v)); },
          [](double v) { return plist_new_real(v); },
          [](const PlistDate& v) { return plist_new_date(dateSeconds(v), 0); },
          [](const PlistValue::Data& v) {
            return plist_new_data(reinterpret_cast<const char*>(v.data()), v.size());
          },
          [](const PlistArray& v) {
            plist_t array = plist_new_array();
            for (const PlistValue& item : v) plist_array_append_item(array, newNode(item));
            return array;
          },
          [](const PlistDictionary& v) {
            plist_t dictionary = plist_new_dict();
            for (const auto& [key, item] : v)
              plist_dict_set_item(dictionary, xmlText(key, kReplacementCharacter).c_str(), newNode(item));
            return dictionary;
          }},
      value.value);
}

constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";
/// Far above every limit on files. libplist takes lengths as 32 bits.
constexpr std::size_t kParseLimit = 64U << 20;

Error systemFailure(int error) { return {std::strerror(error), error}; }

std::string lowered(std::string text) {
  for (char& c : text) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return text;
}

}  // namespace

const PlistValue* PlistValue::under(std::string_view key) const {
  const PlistDictionary* all = dictionary();
  if (all == nullptr) return nullptr;
  const auto found = all->find(key);
  return found == all->end() ? nullptr : &found->second;
}

const std::string* PlistValue::textUnder(std::string_view key) const {
  const PlistValue* found = under(key);
  return found == nullptr ? nullptr : found->string();
}

double PlistValue::asReal() const {
  if (const auto* v = std::get_if<double>(&value)) return *v;
  if (const auto* v = std::get_if<std::int64_t>(&value)) return static_cast<double>(*v);
  if (const auto* v = std::get_if<bool>(&value)) return *v ? 1 : 0;
  if (const auto* v = std::get_if<std::string>(&value)) return std::strtod(v->c_str(), nullptr);
  return 0;
}

std::int64_t PlistValue::asInteger() const {
  if (const auto* v = std::get_if<std::int64_t>(&value)) return *v;
  if (const auto* v = std::get_if<std::string>(&value)) return std::strtoll(v->c_str(), nullptr, 10);
  const double real = asReal();
  return real >= -9e18 && real <= 9e18 ? static_cast<std::int64_t>(real) : 0;
}

bool PlistValue::asBool() const {
  if (const auto* v = std::get_if<std::string>(&value)) {
    const std::string text = lowered(*v);
    return text == "true" || text == "yes" || asInteger() != 0;
  }
  return asReal() != 0;
}

PlistResult parsePropertyList(const std::string& bytes, PlistLimits limits) {
  std::string_view text = bytes;
  if (text.starts_with(kByteOrderMark)) text.remove_prefix(kByteOrderMark.size());
  if (text.empty()) return Error{"the file is empty"};
  if (text.size() > kParseLimit) return Error{"larger than " + std::to_string(kParseLimit) + " bytes"};
  plist_t root = nullptr;
  if (text.starts_with("bplist00")) {
    if (auto refused = refuseBinary(text, limits.values)) return Error{std::move(*refused)};
    plist_from_bin(text.data(), static_cast<std::uint32_t>(text.size()), &root);
  } else if (text.find('<') != std::string_view::npos) {
    const XmlCheck check = checkXml(text, limits.values);
    if (check.refused) return Error{*check.refused};
    plist_from_xml(check.clean.c_str(), static_cast<std::uint32_t>(check.clean.size()), &root);
  } else {
    return Error{"neither an XML nor a binary property list"};
  }
  const Node node(root);
  if (!node) return Error{"not a well-formed property list"};
  return valueFrom(node.get());
}

PlistResult readPropertyList(const std::string& path, PlistLimits limits) {
  const UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  struct stat info {};
  if (!file.valid() || fstat(file.get(), &info) != 0) return systemFailure(errno);
  if (!S_ISREG(info.st_mode)) return Error{"not a regular file", S_ISDIR(info.st_mode) ? EISDIR : EINVAL};
  std::string bytes;
  char buffer[16384];
  for (;;) {
    const ssize_t n = read(file.get(), buffer, sizeof buffer);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) return systemFailure(errno);
    if (n == 0) return parsePropertyList(bytes, limits);
    bytes.append(buffer, static_cast<std::size_t>(n));
    if (bytes.size() > limits.bytes)
      return Error{"larger than " + std::to_string(limits.bytes) + " bytes", EFBIG};
  }
}

std::string propertyListXml(const PlistValue& value) {
  const Node node(newNode(value));
  char* text = nullptr;
  std::uint32_t length = 0;
  plist_to_xml(node.get(), &text, &length);
  const std::unique_ptr<char, decltype(&std::free)> owner(text, &std::free);
  return text == nullptr ? std::string() : std::string(text, length);
}

int writePropertyList(const std::string& path, const PlistValue& value, unsigned mode) {
  return writeFileAtomically(path, propertyListXml(value), mode);
}

}  // namespace lmx
