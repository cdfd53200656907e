// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#define LOG_TAG "vyrservice_main"

#include <log/log.h>

#include <cstdlib>
#include <memory>
#include <set>
#include <string>

#include "apex_status_dump.h"
#include "apex_update_listener.h"
#include "vyrservice.h"

namespace {

constexpr char kCameraHalApex[] = "com.tarven.nomil.camera.hal";
constexpr char kApexInfoList[] = "/apex/apex-info-list.xml";

}  // namespace

int main() {
    std::unique_ptr<ApexUpdateListener> listener = ApexUpdateListener::Make(
        kCameraHalApex,
        [](const std::set<ApexUpdateListener::Info>&, const std::set<ApexUpdateListener::Info>&) {
            // A clean exit: whatever supervises the service starts it against the new HAL.
            ALOGI("APEX version updated. Restarting.");
            exit(0);
        },
        false, kApexInfoList);
    ALOGI("Using ApexUpdateListener: %p", listener.get());

    android::vyr::binder::CreateAndRegisterService(
        [watched = listener.get()](android::vyr::binder::VYRService& service) {
            if (watched == nullptr) return;
            service.SetApexSection(
                [watched] { return android::vyr::binder::ApexStatusDump(watched->GetStatus()); });
            // The service lives for the whole process, as the listener does.
            watched->SetReloadObserver([&service](const std::string& outcome) {
                service.RecordEvent("APEX reload: " + outcome);
            });
        });
    android::vyr::binder::JoinThreadPool();

    // Leaving the binder pool means the service can no longer be reached.
    listener.reset();
    return 1;
}
