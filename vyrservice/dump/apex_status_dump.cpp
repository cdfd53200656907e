// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "apex_status_dump.h"

namespace android {
namespace vyr {
namespace binder {

DumpValue ApexStatusDump(const ApexUpdateListener::Status& status) {
    DumpValue apex = DumpValue::Object();
    apex.Set("package", status.package);
    apex.Set("path", status.path);
    apex.Set("reloads", status.reloads);
    DumpValue& records = apex.Set("records", DumpValue::Array());
    for (const ApexUpdateListener::Info& info : status.records) {
        DumpValue& record = records.Append(DumpValue::Object());
        record.Set("module_path", info.module_path);
        record.Set("preinstalled_module_path", info.preinstalled_module_path);
        record.Set("version_code", info.version_code);
        record.Set("version_name", info.version_name);
        record.Set("is_factory", info.is_factory);
        record.Set("is_active", info.is_active);
    }
    return apex;
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
