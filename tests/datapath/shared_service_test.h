// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// Fixture: one real vyrservice process for a whole suite (its start-up takes 4 s), with this
// process's binder pool started, since its tests hand out callbacks of their own.

#include <aidl/android/vyr/IVYRService.h>
#include <android/binder_process.h>
#include <gtest/gtest.h>

#include <chrono>
#include <memory>

#include "service_process.h"

namespace vyr_test::datapath {

class SharedServiceTest : public ::testing::Test {
  protected:
    // The service waits 4 s before it registers; sanitizer builds start slower still.
    static constexpr std::chrono::milliseconds kRegistration{30000};

    static void SetUpTestSuite() {
        ABinderProcess_startThreadPool();
        process_ = new vyr_test::ServiceProcess();
        if (process_->Start(VYRSERVICE_PATH)) service_ = process_->WaitForService(kRegistration);
    }

    static void TearDownTestSuite() {
        service_.reset();
        delete process_;
        process_ = nullptr;
    }

    void SetUp() override {
        ASSERT_NE(service_, nullptr) << "vyrservice did not register; its log:\n"
                                     << process_->Log();
    }

    void TearDown() override {
        EXPECT_TRUE(process_->Running()) << "vyrservice ended; its log:\n" << process_->Log();
    }

    static inline vyr_test::ServiceProcess* process_ = nullptr;
    static inline std::shared_ptr<aidl::android::vyr::IVYRService> service_;
};

}  // namespace vyr_test::datapath
