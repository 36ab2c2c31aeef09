// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <exception>
#include <string>

#include "host/hostexport.h"

namespace zarn {

/// Base of everything the library throws. `Message()` says what went wrong; source file, function
/// and line say where it was thrown. The source file may be a logical path ("gobs/raster/raster").
///
/// The place defaults to that of the caller, through the built-ins behind `std::source_location`,
/// which clang has only from version 15.
class ZARN_HOST_EXPORT Exception : public std::exception {
 public:
  explicit Exception(std::string message, std::string sourceFile = __builtin_FILE(),
                     std::string function = __builtin_FUNCTION(),
                     std::uint32_t line = __builtin_LINE());
  Exception(const Exception&) = default;
  Exception& operator=(const Exception&) = default;
  ~Exception() override;

  const char* what() const noexcept override { return message_.c_str(); }
  const std::string& Message() const noexcept { return message_; }
  const std::string& SourceFile() const noexcept { return sourceFile_; }
  const std::string& Function() const noexcept { return function_; }
  std::uint32_t Line() const noexcept { return line_; }

 private:
  std::string message_;
  std::string sourceFile_;
  std::string function_;
  std::uint32_t line_ = 0;
};

/// A parameter was refused. `ParameterName()` names it; `Type()` is the host's numeric reason.
class ZARN_HOST_EXPORT ParameterException : public Exception {
 public:
  ParameterException(std::string message, std::string parameterName, std::int32_t type,
                     std::string sourceFile, std::string function, std::uint32_t line);
  ParameterException(const ParameterException&) = default;
  ParameterException& operator=(const ParameterException&) = default;
  ~ParameterException() override;

  const std::string& ParameterName() const noexcept { return parameterName_; }
  std::int32_t Type() const noexcept { return type_; }

 private:
  std::string parameterName_;
  std::int32_t type_ = 0;
};

/// The data themselves cannot be handled (a block that is too large, say).
class ZARN_HOST_EXPORT DataException : public Exception {
 public:
  using Exception::Exception;
  DataException(const DataException&) = default;
  DataException& operator=(const DataException&) = default;
  ~DataException() override;
};

}  // namespace zarn
