// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include "apex_update_listener.h"
#include "dump_value.h"

namespace android {
namespace vyr {
namespace binder {

// The APEX listener's part of the service's dump.
DumpValue ApexStatusDump(const ApexUpdateListener::Status& status);

}  // namespace binder
}  // namespace vyr
}  // namespace android
