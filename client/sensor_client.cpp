// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "vyr/sensor_client.h"

#include "sensor_client_core.h"

namespace vyr {

SensorClient::SensorClient(SensorSettings settings, SensorClientListener* listener,
                           ReattachPolicy policy)
    : core_(std::make_shared<Core>(std::move(settings), listener, policy)) {}

SensorClient::~SensorClient() {
    Stop();
}

int32_t SensorClient::Start(std::shared_ptr<aidl::android::vyr::IVYRService> service) {
    return core_->Start(std::move(service));
}

void SensorClient::Stop() {
    core_->Stop();
}

int32_t SensorClient::Poll(aidl::android::vyr::Event* event) {
    return core_->Poll(event);
}

int32_t SensorClient::handle() const {
    return core_->handle();
}

SensorClient::State SensorClient::state() const {
    return core_->state();
}

}  // namespace vyr
