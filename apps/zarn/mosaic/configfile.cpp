// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/configfile.h"

#include <CLI/CLI.hpp>
#include <exception>
#include <fstream>
#include <nlohmann/json.hpp>
#include <set>
#include <string>
#include <vector>

#include "apps/zarn/errors.h"

namespace zarn::app {
namespace {

using nlohmann::json;

std::string TextOf(const json& value) {
  return value.is_string() ? value.get<std::string>() : value.dump();
}

CLI::Option* Find(CLI::App& command, const std::string& key) {
  if (CLI::Option* const option = command.get_option_no_throw("--" + key)) return option;
  std::string upper = key;
  for (char& c : upper) c = static_cast<char>(CLI::detail::to_lower(std::string(1, c))[0]);
  for (CLI::Option* const option : command.get_options()) {
    if (option->get_positional() && CLI::detail::to_lower(option->get_name(true)) == upper) {
      return option;
    }
  }
  return nullptr;
}

void Set(CLI::Option& option, const json& value, const std::string& place) {
  const bool isFlag = option.get_items_expected_max() == 0;
  if (value.is_boolean() != isFlag || value.is_object() || value.is_null()) {
    throw UsageError(place + ": expected " +
                     (isFlag ? "true or false" : "a string, a number or a list") + ", found " +
                     value.dump());
  }
  if (isFlag) {
    if (value.get<bool>()) option.add_result("true");
  } else if (value.is_array() && option.get_items_expected_max() == 1) {
    // A list that the command line takes as one text.
    std::string text;
    for (const json& entry : value) text += (text.empty() ? "" : ",") + TextOf(entry);
    option.add_result(text);
  } else if (value.is_array()) {
    for (const json& entry : value) option.add_result(TextOf(entry));
  } else {
    option.add_result(TextOf(value));
  }
  if (option.count() == 0) return;
  try {
    option.run_callback();
  } catch (const std::exception& error) {
    throw UsageError(place + ": " + error.what());
  }
}

[[noreturn]] void RefuseUnknown(const std::string& file, const std::string& key) {
  throw UsageError(file + ": there is no option '" + key + "' (see zarn mosaic --help)");
}

std::string PlaceOf(const std::string& file, const std::string& key) {
  return file + ": '" + key + "'";
}

}  // namespace

void ApplyConfig(const std::string& file, CLI::App& command) {
  std::ifstream stream(file, std::ios::binary);
  if (!stream) throw UsageError("cannot read the configuration " + file);
  json config;
  std::set<std::string> keys;
  std::string repeated;
  const auto look = [&](int depth, json::parse_event_t event, const json& parsed) {
    if (event == json::parse_event_t::key && depth == 1 &&
        !keys.insert(parsed.get<std::string>()).second) {
      repeated = parsed.get<std::string>();
    }
    return true;
  };
  try {
    config = json::parse(stream, look);
  } catch (const std::exception& error) {
    throw UsageError(file + " is not JSON: " + error.what());
  }
  if (!repeated.empty()) throw UsageError(PlaceOf(file, repeated) + " is there twice");
  if (!config.is_object()) throw UsageError(file + ": expected an object of options");
  for (const auto& [key, value] : config.items()) {
    CLI::Option* const option = Find(command, key);
    if (option == nullptr || key == "config" || key == "help") {
      RefuseUnknown(file, key);
    }
    if (option->count() == 0) Set(*option, value, PlaceOf(file, key));
  }
}

}  // namespace zarn::app
