// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace zarn::app {

/// The page of a report with its looks and behaviour, to be given its contents by `Filled`. It
/// needs nothing but itself: what it shows is in it, and it forbids itself the network.
extern const char* const kReportSkeleton;

}  // namespace zarn::app
