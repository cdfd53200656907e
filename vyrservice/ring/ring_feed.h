// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include "service_mode_params.h"

namespace android {
namespace vyr {
namespace binder {

// Called by the processing loop as it stores a sample, with the block's data_mutex held: writes
// a valid sample into the mode's ring while a client is enabled on it (EnableRing).
void FeedRing(ServiceModeParams& params);

}  // namespace binder
}  // namespace vyr
}  // namespace android
