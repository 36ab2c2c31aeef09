// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <vector>

namespace zarn::processes::filters {

enum class CellStatus : char {
  kValid = 'G',
  kInvalid = 'I',  ///< no stretch fits its pixels, or one that does not fit its neighbours
  kNoData = 'N',   ///< too few pixels
  kMasked = 'M',
};

/// Gain, offset and status of the cells of a grid. Cells are numbered row by row.
class CellGrid {
 public:
  /// All cells valid, all gains and offsets 0.
  CellGrid(int rows, int columns, int channels)
      : rows_(rows),
        columns_(columns),
        channels_(channels),
        statuses_(static_cast<std::size_t>(rows) * static_cast<std::size_t>(columns),
                  CellStatus::kValid),
        values_(statuses_.size() * 2 * static_cast<std::size_t>(channels)) {}

  int Rows() const { return rows_; }
  int Columns() const { return columns_; }
  int Channels() const { return channels_; }
  std::size_t CellCount() const { return statuses_.size(); }

  bool Contains(int row, int column) const {
    return row >= 0 && row < rows_ && column >= 0 && column < columns_;
  }
  bool Contains(int row, int column, int channel) const {
    return Contains(row, column) && channel >= 0 && channel < channels_;
  }
  std::size_t Cell(int row, int column) const {
    return static_cast<std::size_t>(row) * static_cast<std::size_t>(columns_) +
           static_cast<std::size_t>(column);
  }
  int RowOf(std::size_t cell) const {
    return static_cast<int>(cell / static_cast<std::size_t>(columns_));
  }
  int ColumnOf(std::size_t cell) const {
    return static_cast<int>(cell % static_cast<std::size_t>(columns_));
  }

  CellStatus Status(std::size_t cell) const { return statuses_[cell]; }
  bool IsValid(std::size_t cell) const { return statuses_[cell] == CellStatus::kValid; }
  void SetStatus(std::size_t cell, CellStatus status) { statuses_[cell] = status; }

  float Gain(std::size_t cell, int channel) const { return values_[Index(cell, channel)]; }
  float Offset(std::size_t cell, int channel) const { return values_[Index(cell, channel) + 1]; }
  void Set(std::size_t cell, int channel, float gain, float offset) {
    values_[Index(cell, channel)] = gain;
    values_[Index(cell, channel) + 1] = offset;
  }

 private:
  std::size_t Index(std::size_t cell, int channel) const {
    return 2 * (cell * static_cast<std::size_t>(channels_) + static_cast<std::size_t>(channel));
  }

  int rows_;
  int columns_;
  int channels_;
  std::vector<CellStatus> statuses_;
  std::vector<float> values_;  ///< per cell gain and offset of each channel
};

}  // namespace zarn::processes::filters
