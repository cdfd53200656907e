// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// A batch that the client's transaction buffer cannot take is split and sent again. On a device
// that buffer is shared with every other call in flight to the client's process; here the client
// holds most of its own buffer through the host runtime to stand for that traffic.

#include <gtest/gtest.h>
#include <vyr/binder_host.h>

#include <cstddef>
#include <vector>

#include "doubles_service_fixture.h"
#include "event_parcel.h"
#include "recording_callback.h"

namespace vyr_test::datapath {
namespace {

using aidl::android::vyr::Event;

// libbinder's buffer: 1 MiB less two pages.
constexpr size_t kBufferBytes = (size_t{1} << 20) - 2 * 4096;
// What the client leaves free: a quarter of a full batch.
constexpr size_t kFreeBytes = 24 * 1024;

class BatchLimitTest : public ServiceAcrossProcessesTest {
  protected:
    void TearDown() override {
        VyrBinder_releaseTransactionBuffer();
        ServiceAcrossProcessesTest::TearDown();
    }
};

TEST_F(BatchLimitTest, ABatchTheClientsBufferRefusesIsSplitAndDeliveredWhole) {
    const int32_t handle = OpenRange();
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = -1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    ASSERT_EQ(result, 0);
    ASSERT_TRUE(VyrBinder_holdTransactionBuffer(kBufferBytes - kFreeBytes));
    // Held until the byte budget hands the batch over, more than the client has room for.
    ASSERT_TRUE(service_->EnableOnSample(handle, 1, 60000, &result).isOk());
    ASSERT_EQ(result, 0);
    ASSERT_TRUE(callback->WaitForBatches(4, 3 * kDeadline)) << "no batch arrived in pieces";
    ASSERT_TRUE(service_->Flush(handle, &result).isOk());
    ASSERT_EQ(result, 0);
    ASSERT_TRUE(callback->WaitForFlushes(1, kDeadline));
    ASSERT_TRUE(service_->Disable(handle).isOk());
    VyrBinder_releaseTransactionBuffer();

    const std::vector<Event> events = callback->Events();
    ASSERT_GT(events.size(), 500u) << "a budget's worth of one-zone events";
    for (size_t i = 0; i < events.size(); ++i) {
        ASSERT_EQ(events[i].timestamp, events[0].timestamp + static_cast<int64_t>(i))
            << "every sample once, in order, at " << i;
    }
    size_t at = 0;
    for (size_t size : callback->BatchSizes()) {
        const std::vector<Event> batch(events.begin() + at, events.begin() + at + size);
        EXPECT_LE(vyr_test::EventsParcelBytes(batch), kFreeBytes)
            << "a piece that did not fit was delivered";
        at += size;
    }
    ASSERT_TRUE(service_->Close(handle).isOk());
}

}  // namespace
}  // namespace vyr_test::datapath
