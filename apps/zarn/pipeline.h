// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <functional>
#include <vector>

namespace zarn::app {

/// One stage of a pipeline: does its part of job `job`, whose buffers are slot `slot`.
using Stage = std::function<void(std::size_t job, std::size_t slot)>;

/// Takes jobs 0 .. `jobs` - 1 through all `stages`, in order, each stage on a thread of its own
/// (`callersStage` on the calling thread), so that the stages overlap.
///
/// Job j uses slot j % `slots`, and no job enters before the job that had its slot has left: the
/// slots bound the memory. With two slots or more, the slot of the job before is still intact while
/// the first stage runs. The first exception of any stage stops all of them and is rethrown.
void RunPipeline(std::size_t jobs, std::size_t slots, const std::vector<Stage>& stages,
                 std::size_t callersStage);

/// The same on the calling thread alone, one job after the other.
void RunOnOneThread(std::size_t jobs, std::size_t slots, const std::vector<Stage>& stages);

}  // namespace zarn::app
