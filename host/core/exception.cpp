// SPDX-License-Identifier: Apache-2.0
#include "host/core/exception.h"

#include <utility>

namespace zarn {

Exception::Exception(std::string message, std::string sourceFile, std::string function,
                     std::uint32_t line)
    : message_(std::move(message)),
      sourceFile_(std::move(sourceFile)),
      function_(std::move(function)),
      line_(line) {}

Exception::~Exception() = default;

ParameterException::ParameterException(std::string message, std::string parameterName,
                                       std::int32_t type, std::string sourceFile,
                                       std::string function, std::uint32_t line)
    : Exception(std::move(message), std::move(sourceFile), std::move(function), line),
      parameterName_(std::move(parameterName)),
      type_(type) {}

ParameterException::~ParameterException() = default;

DataException::~DataException() = default;

}  // namespace zarn
