// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/parameters.h"

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <limits>
#include <nlohmann/json.hpp>
#include <set>
#include <system_error>
#include <utility>

#include "apps/zarn/errors.h"

namespace zarn::app {
namespace {

using nlohmann::json;

std::string Quoted(const std::vector<std::string>& keys) {
  std::string list;
  for (const std::string& key : keys) list += (list.empty() ? "'" : ", '") + key + "'";
  return list;
}

// A value as it stands in the file, cut where it would fill the terminal.
std::string Excerpt(const json& value) {
  constexpr std::size_t kLongest = 40;
  const std::string text = value.dump(-1, ' ', true);
  return text.size() <= kLongest ? text : text.substr(0, kLongest) + "...";
}

std::string Alternatives(const std::vector<std::size_t>& lengths) {
  std::string text;
  for (std::size_t i = 0; i < lengths.size(); ++i) {
    const char* const separator = i == 0 ? "" : i + 1 == lengths.size() ? " or " : ", ";
    text += separator + std::to_string(lengths[i]);
  }
  return text;
}

bool IsWhole(const json& value, double least, double most) {
  if (!value.is_number()) return false;
  const auto number = value.get<double>();
  return number == std::trunc(number) && number >= least && number <= most;
}

// The parser keeps the last of two equal keys, and the first would be ignored in silence.
class DuplicateKeys {
 public:
  void Visit(json::parse_event_t event, const json& value) {
    if (event == json::parse_event_t::object_start) keys_.emplace_back();
    if (event == json::parse_event_t::object_end) keys_.pop_back();
    if (event != json::parse_event_t::key) return;
    const auto key = value.get<std::string>();
    if (!keys_.back().insert(key).second) first_ = key;
  }
  const std::string& First() const { return first_; }

 private:
  std::vector<std::set<std::string>> keys_;
  std::string first_;
};

std::vector<std::string> WithChannels(std::vector<std::string> keys) {
  keys.emplace_back("channels");
  return keys;
}

json Parse(const std::string& name) {
  std::error_code error;
  if (std::filesystem::is_directory(name, error)) {
    throw UsageError("cannot read " + name + ": it is a folder");
  }
  std::ifstream file(name, std::ios::binary);
  if (!file) throw UsageError("cannot read " + name + ": " + std::strerror(errno));
  DuplicateKeys duplicates;
  json result;
  try {
    result = json::parse(file, [&](int, json::parse_event_t event, const json& value) {
      duplicates.Visit(event, value);
      return true;
    });
  } catch (const json::exception& failure) {
    // The library's own name for the failure stands in brackets before it.
    const std::string text = failure.what();
    const std::size_t bracket = text.find("] ");
    throw UsageError(name + " is not valid JSON: " +
                     (bracket == std::string::npos ? text : text.substr(bracket + 2)));
  }
  if (!duplicates.First().empty()) {
    throw UsageError(name + ": the key '" + duplicates.First() +
                     "' stands twice in the same object");
  }
  return result;
}

}  // namespace

ParameterObject::ParameterObject(const json& value, std::string place,
                                 const std::vector<std::string>& keys)
    : value_(&value), place_(std::move(place)) {
  if (!value.is_object()) {
    throw UsageError(place_ + ": expected an object with the keys " + Quoted(keys) + ", found " +
                     Excerpt(value));
  }
  for (const auto& [key, unused] : value.items()) {
    if (std::find(keys.begin(), keys.end(), key) != keys.end()) continue;
    throw UsageError(place_ + ": unknown key '" + key + "'; expected " + Quoted(keys));
  }
}

bool ParameterObject::Has(const std::string& key) const { return value_->contains(key); }

void ParameterObject::Refuse(const std::string& key, const std::string& expected,
                             const std::string& found) const {
  throw UsageError(place_ + ", '" + key + "': expected " + expected + ", found " + found);
}

void ParameterObject::Refuse(const std::string& key, const std::string& expected) const {
  Refuse(key, expected, Excerpt(At(key, expected)));
}

const json& ParameterObject::At(const std::string& key, const std::string& expected) const {
  const auto found = value_->find(key);
  if (found == value_->end()) Refuse(key, expected, "nothing");
  return *found;
}

const json& ParameterObject::ListAt(const std::string& key, const std::vector<std::size_t>& lengths,
                                    const std::string& expected) const {
  const json& list = At(key, expected);
  if (!list.is_array()) Refuse(key, expected);
  if (std::find(lengths.begin(), lengths.end(), list.size()) == lengths.end()) {
    Refuse(key, expected, "a list of " + std::to_string(list.size()));
  }
  return list;
}

std::string ParameterObject::Text(const std::string& key) const {
  const json& value = At(key, "a string");
  if (!value.is_string() || value.get<std::string>().empty()) Refuse(key, "a string");
  return value.get<std::string>();
}

double ParameterObject::Number(const std::string& key) const {
  const json& value = At(key, "a number");
  if (!value.is_number()) Refuse(key, "a number");
  return value.get<double>();
}

std::vector<double> ParameterObject::Numbers(const std::string& key,
                                             const std::vector<std::size_t>& lengths) const {
  const json& list = ListAt(key, lengths, "a list of " + Alternatives(lengths) + " numbers");
  std::vector<double> numbers;
  for (const json& value : list) {
    if (!value.is_number()) {
      Refuse(key + "[" + std::to_string(numbers.size()) + "]", "a number", Excerpt(value));
    }
    numbers.push_back(value.get<double>());
  }
  return numbers;
}

std::vector<std::uint8_t> ParameterObject::Bytes(const std::string& key, std::size_t length) const {
  const json& list =
      ListAt(key, {length}, "a list of " + std::to_string(length) + " whole numbers from 0 to 255");
  std::vector<std::uint8_t> bytes;
  for (const json& value : list) {
    if (!IsWhole(value, 0, 255)) {
      Refuse(key + "[" + std::to_string(bytes.size()) + "]", "a whole number from 0 to 255",
             Excerpt(value));
    }
    bytes.push_back(static_cast<std::uint8_t>(value.get<double>()));
  }
  return bytes;
}

std::uint32_t ParameterObject::Count(const std::string& key) const {
  constexpr auto kMost = std::numeric_limits<std::uint32_t>::max();
  const std::string expected = "a whole number from 1 to " + std::to_string(kMost);
  const json& value = At(key, expected);
  if (!IsWhole(value, 1, kMost)) Refuse(key, expected);
  return static_cast<std::uint32_t>(value.get<double>());
}

std::vector<ParameterObject> ParameterObject::Objects(const std::string& key,
                                                      const std::string& entry,
                                                      const std::vector<std::string>& keys) const {
  const std::string expected = "a list of objects";
  const json& list = At(key, expected);
  if (!list.is_array() || list.empty()) Refuse(key, expected);
  std::vector<ParameterObject> objects;
  for (const json& value : list) {
    objects.emplace_back(value, place_ + ", " + entry + " " + std::to_string(objects.size() + 1),
                         keys);
  }
  return objects;
}

ParameterFile::ParameterFile(const std::string& name, const std::vector<std::string>& keys,
                             const std::vector<std::string>& channelKeys)
    : json_(std::make_unique<const json>(Parse(name))),
      whole_(*json_, name, WithChannels(keys)),
      channels_(whole_.Objects("channels", "channel", channelKeys)) {}

ParameterFile::~ParameterFile() = default;

}  // namespace zarn::app
