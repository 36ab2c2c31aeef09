// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/enhancement/glut.h"

#include <cstdint>
#include <memory>
#include <optional>

#include "processes/filters/enhancement/glutdiagnostics.h"
#include "processes/filters/enhancement/powerglutmatrix.h"

// NOLINTNEXTLINE(readability-identifier-naming): hosts know it by this name
namespace zarn::processes::filters::GLUT {
namespace {

bool HasSensibleSize(const GLUTParameters& parameters) {
  if (parameters.gridRows < 0 || parameters.gridColumns < 0 || parameters.channelCount < 0) {
    return false;
  }
  // A cell has its status and two floats for each channel.
  constexpr std::uint64_t kMostBytes = std::uint64_t{1} << 32;
  const auto cells = static_cast<std::uint64_t>(parameters.gridRows) *
                     static_cast<std::uint64_t>(parameters.gridColumns);
  const std::uint64_t cellBytes =
      1 + 2 * sizeof(float) * static_cast<std::uint64_t>(parameters.channelCount);
  return cells <= kMostBytes / cellBytes;
}

template <typename T>
std::unique_ptr<IGeoLUTMatrix> ReadMatrix(const GLUTParameters& parameters,
                                          datasources::IRasterReader& classes,
                                          datasources::IRasterReader& coefficients) {
  auto matrix = std::make_unique<PowerGLUTMatrix<T>>(parameters);
  ReadCells(classes, coefficients, matrix->Grid());
  return matrix;
}

}  // namespace

IGeoLUTMatrix* GetGLUTMatrix(const GLUTParameters& parameters) {
  if (!HasSensibleSize(parameters)) return nullptr;
  if (parameters.pixelDepth == 8) return new PowerGLUTMatrix<unsigned char>(parameters);
  if (parameters.pixelDepth == 16) return new PowerGLUTMatrix<unsigned short>(parameters);
  return nullptr;
}

IGeoLUTMatrix* GetGLUTMatrix(datasources::IRasterReader* classes,
                             datasources::IRasterReader* coefficients) {
  if (classes == nullptr || coefficients == nullptr) return nullptr;
  const std::optional<GLUTParameters> parameters = ReadParameters(*classes, *coefficients);
  if (!parameters || !HasSensibleSize(*parameters)) return nullptr;
  if (parameters->pixelDepth == 8) {
    return ReadMatrix<unsigned char>(*parameters, *classes, *coefficients).release();
  }
  if (parameters->pixelDepth == 16) {
    return ReadMatrix<unsigned short>(*parameters, *classes, *coefficients).release();
  }
  return nullptr;
}

}  // namespace zarn::processes::filters::GLUT
