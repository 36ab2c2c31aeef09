// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <nlohmann/json_fwd.hpp>
#include <string>
#include <vector>

namespace zarn::app {

/// One object of a parameter file. What does not have the form that is asked for is a `UsageError`
/// that names file, channel and key, what was expected and what was found.
class ParameterObject {
 public:
  /// `place` is what messages call the object; it may have no other keys than `keys`.
  ParameterObject(const nlohmann::json& value, std::string place,
                  const std::vector<std::string>& keys);

  bool Has(const std::string& key) const;
  /// A string that is not empty.
  std::string Text(const std::string& key) const;
  /// A finite number.
  double Number(const std::string& key) const;
  /// Finite numbers, as many as one of `lengths`.
  std::vector<double> Numbers(const std::string& key,
                              const std::vector<std::size_t>& lengths) const;
  /// `length` whole numbers from 0 to 255.
  std::vector<std::uint8_t> Bytes(const std::string& key, std::size_t length) const;
  /// A whole number from 1 to 2^32 - 1.
  std::uint32_t Count(const std::string& key) const;
  /// A list of at least one object, which messages call "`entry` 1" and so on; they may have no
  /// other keys than `keys`.
  std::vector<ParameterObject> Objects(const std::string& key, const std::string& entry,
                                       const std::vector<std::string>& keys) const;
  /// Refuses the value of `key`, for what the operations above cannot know of it.
  [[noreturn]] void Refuse(const std::string& key, const std::string& expected) const;

 private:
  const nlohmann::json& At(const std::string& key, const std::string& expected) const;
  const nlohmann::json& ListAt(const std::string& key, const std::vector<std::size_t>& lengths,
                               const std::string& expected) const;
  [[noreturn]] void Refuse(const std::string& key, const std::string& expected,
                           const std::string& found) const;

  const nlohmann::json* value_;
  std::string place_;
};

/// The parameters of a filter: a JSON file with one object whose key "channels" is a list of
/// objects, one per channel of the image or one for all.
class ParameterFile {
 public:
  /// The keys that the file may have beside "channels", and those of each channel. Throws
  /// `UsageError` when the file cannot be read, is not JSON or has another form.
  ParameterFile(const std::string& name, const std::vector<std::string>& keys,
                const std::vector<std::string>& channelKeys);
  ~ParameterFile();
  ParameterFile(const ParameterFile&) = delete;
  ParameterFile& operator=(const ParameterFile&) = delete;

  /// What concerns the image as a whole.
  const ParameterObject& Whole() const { return whole_; }
  /// At least one.
  const std::vector<ParameterObject>& Channels() const { return channels_; }

 private:
  std::unique_ptr<const nlohmann::json> json_;
  ParameterObject whole_;
  std::vector<ParameterObject> channels_;
};

}  // namespace zarn::app
