// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The service's trace points: slices around each sensor read, delivery and work item, and
// counters of each mode's enable count and active period. The test defines libcutils' trace
// functions itself, which this executable's calls reach instead of the library's (that do
// nothing on a host), and records what would reach the kernel's trace buffer.

#define ATRACE_TAG ATRACE_TAG_CAMERA

#include <cutils/trace.h>

#include <algorithm>
#include <mutex>
#include <string>
#include <vector>

#include "recording_callback.h"
#include "sensor_doubles.h"
#include "service_fixture.h"

namespace vyr_test::service {
namespace {

std::mutex g_trace_mutex;
bool g_capturing = false;
// "B name", "E", "C name=value", in order.
std::vector<std::string> g_trace;

void Record(std::string entry) {
    std::lock_guard<std::mutex> lock(g_trace_mutex);
    if (g_capturing) g_trace.push_back(std::move(entry));
}

// Captures the camera category while it lives.
class TraceCapture {
  public:
    TraceCapture() { SetCapturing(true); }
    ~TraceCapture() { SetCapturing(false); }
    TraceCapture(const TraceCapture&) = delete;
    TraceCapture& operator=(const TraceCapture&) = delete;

    std::vector<std::string> Entries() const {
        std::lock_guard<std::mutex> lock(g_trace_mutex);
        return g_trace;
    }
    size_t Count(const std::string& entry) const {
        const std::vector<std::string> entries = Entries();
        return static_cast<size_t>(std::count(entries.begin(), entries.end(), entry));
    }

  private:
    static void SetCapturing(bool on) {
        std::lock_guard<std::mutex> lock(g_trace_mutex);
        g_capturing = on;
        g_trace.clear();
    }
};

}  // namespace
}  // namespace vyr_test::service

extern "C" {
uint64_t atrace_get_enabled_tags() {
    std::lock_guard<std::mutex> lock(vyr_test::service::g_trace_mutex);
    return vyr_test::service::g_capturing ? ATRACE_TAG_CAMERA : 0;
}
void atrace_begin_body(const char* name) {
    vyr_test::service::Record(std::string("B ") + name);
}
void atrace_end_body() {
    vyr_test::service::Record("E");
}
void atrace_int_body(const char* name, int32_t value) {
    vyr_test::service::Record(std::string("C ") + name + "=" + std::to_string(value));
}
}

namespace vyr_test::service {
namespace {

using sensor_doubles::kRangeProcess;
using sensor_doubles::WaitForCalls;
using TracePointsTest = ServiceFixture;

// Every slice that begins ends, and none ends before it began: over all threads together, the
// "E" entries never outnumber the "B" entries before them.
bool Balanced(const std::vector<std::string>& entries) {
    int open = 0;
    for (const std::string& entry : entries) {
        if (entry.rfind("B ", 0) == 0) ++open;
        if (entry == "E" && --open < 0) return false;
    }
    return open == 0;
}

TEST_F(TracePointsTest, WorkReadsDeliveriesAndCountersAreTraced) {
    TraceCapture trace;
    MakeService();
    const int32_t handle = Open(3);
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = 1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    ASSERT_EQ(result, 0);
    MultiRangingData data{};
    data.valid = 1;
    data.zone_count = 1;
    sensor_doubles::SetRangeData(data);
    ASSERT_EQ(Enable(handle, 20), 0);
    ASSERT_TRUE(callback->WaitForEvents(1, kWait));
    ASSERT_TRUE(WaitForCalls(kRangeProcess, 2, kWait));
    DisableAndWait(handle);
    ASSERT_TRUE(service_->Close(handle).isOk());

    EXPECT_EQ(trace.Count("B vyr enable work"), 1u);
    EXPECT_EQ(trace.Count("B vyr disable work"), 1u);
    EXPECT_GE(trace.Count("B vyr range read"), 2u);
    EXPECT_GE(trace.Count("B vyr deliver"), 1u);
    EXPECT_EQ(trace.Count("B vyr als read"), 0u);
    EXPECT_EQ(trace.Count("C vyr mode 3 enable count=1"), 1u);
    EXPECT_EQ(trace.Count("C vyr mode 3 active period ms=20"), 2u) << "after enable and disable";
    EXPECT_EQ(trace.Count("C vyr mode 3 enable count=0"), 1u);
    const std::vector<std::string> entries = trace.Entries();
    EXPECT_TRUE(Balanced(entries));
    // The counters follow the work item that changed them.
    const auto enable = std::find(entries.begin(), entries.end(), "B vyr enable work");
    const auto counter = std::find(entries.begin(), entries.end(), "C vyr mode 3 enable count=1");
    EXPECT_LT(enable, counter);
}

}  // namespace
}  // namespace vyr_test::service
