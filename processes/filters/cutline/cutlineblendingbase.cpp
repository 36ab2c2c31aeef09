// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/cutline/cutlineblendingbase.h"

#include <algorithm>
#include <limits>

#include "processes/filters/cutline/polygonrowindex.h"

namespace zarn::processes::filters {
namespace {

std::shared_ptr<const PolygonRowIndex> IndexOf(const PolygonParam& polygon, std::uint32_t blend) {
  if (!polygon.Exists()) return nullptr;
  return std::make_shared<PolygonRowIndex>(polygon, blend);
}

int ToInt(std::int64_t row) {
  using Limits = std::numeric_limits<int>;
  return static_cast<int>(std::clamp<std::int64_t>(row, Limits::min(), Limits::max()));
}

}  // namespace

CutlineBlendingBase::CutlineBlendingBase(const PolygonParam& cutlineParam, unsigned int blend)
    : cutline(IndexOf(cutlineParam, blend)) {}

CutlineBlendingBase::CutlineBlendingBase(const CutlineBlendingBase& other)
    : CutlineBlendingBase(PolygonParam{}, 0) {
  *this = other;
}

CutlineBlendingBase& CutlineBlendingBase::operator=(const CutlineBlendingBase& other) {
  inputNoData = other.inputNoData;
  outputNoData = other.outputNoData;
  cutline = other.cutline;
  tile = other.tile;
  offsetX = other.offsetX;
  offsetY = other.offsetY;
  sourceMap = other.sourceMap;
  sourceMapChannel = other.sourceMapChannel;
  sourceMapValue = other.sourceMapValue;
  stopOnNoData = other.stopOnNoData;
  return *this;
}

CutlineBlendingBase::~CutlineBlendingBase() = default;

void CutlineBlendingBase::SetTileShape(const PolygonParam& tileParam) {
  tile = IndexOf(tileParam, 0);
}

void CutlineBlendingBase::SetOffset(std::uint32_t x, std::uint32_t y) {
  offsetX = x;
  offsetY = y;
}

void CutlineBlendingBase::SetSourceMap(gobs::Raster* map, int channel, long value) {
  sourceMap = map;
  sourceMapChannel = channel;
  sourceMapValue = value;
}

void CutlineBlendingBase::SetStopOnNodata(bool stop) { stopOnNoData = stop; }

void CutlineBlendingBase::GetStartEndY(int& start, int& end) const {
  start = 0;
  end = std::numeric_limits<int>::max();
  if (tile != nullptr) {
    start = ToInt(tile->BandMin());
    end = ToInt(tile->BandMin() + tile->BandCount());
  }
  if (cutline != nullptr) {
    start = std::max(start, ToInt(cutline->BandMin()));
    end = std::min(end, ToInt(cutline->BandMin() + cutline->BandCount()));
  }
}

std::string CutlineBlendingBase::NoDataErrorMessage() { return "Cutline operation aborted."; }

double CutlineBlendingBase::BlendWeight(double x, double y) const {
  if (tile != nullptr && !tile->IsInside(x, y)) return -1.0;
  if (cutline == nullptr) return 1.0;
  const bool inside = cutline->IsInside(x, y);
  if (cutline->Blend() == 0) return inside ? 1.0 : -1.0;
  if (!cutline->RowInBand(y)) return -1.0;
  const double weight = cutline->DistanceToEdge(x, y) / cutline->Blend();
  return inside ? weight : -weight;
}

}  // namespace zarn::processes::filters
