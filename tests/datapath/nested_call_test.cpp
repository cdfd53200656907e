// Calls that a client makes from inside its own OnEvent: they run on the client's notification
// thread, which must neither join itself nor outlive the entry it reads.

#include <android/log.h>

#include <chrono>
#include <future>
#include <string>

#include "in_process_service.h"
#include "thread_count.h"

namespace vyr_datapath {
namespace {

using aidl::android::vyr::Event;

constexpr size_t kRangeBlock = 2;

MultiRangingData Frame(uint32_t time_ms) {
    MultiRangingData data{};
    data.time_ms = time_ms;
    data.zone_count = 1;
    data.valid = 1;
    return data;
}

class NestedCallTest : public InProcessServiceTest {
  protected:
    void SetUp() override {
        InProcessServiceTest::SetUp();
        // Without the light sensor there is no display monitor whose end could race the count.
        StartService(false);
        sensor_doubles::SetRangeData(Frame(7));
        idle_threads_ = vyr_test::ThreadCount();
        handle_ = OpenOk(kRange);
        callback_ = NewCallback();
        int32_t result = 1;
        ASSERT_TRUE(service_->SetCallback(handle_, callback_, &result).isOk());
        ASSERT_EQ(result, 0);
    }

    bool Logged(int priority, const std::string& message) {
        return log_.WaitFor(kTag, priority, message, kWait);
    }
    std::string HandleAndMode() { return "handle " + std::to_string(handle_) + ", mode 3"; }
    // Back to the range worker alone: the notification and processing threads are gone.
    bool NotificationThreadEnded() { return vyr_test::WaitForThreadCount(idle_threads_, kWait); }

    size_t idle_threads_ = 0;
    int32_t handle_ = 0;
    std::shared_ptr<RecordingCallback> callback_;
};

TEST_F(NestedCallTest, DisableFromOnEventDisablesAndEndsTheThread) {
    callback_->SetReaction([this](size_t count) {
        if (count == 1) service_->Disable(handle_);
    });
    EnableOk(handle_, 1);
    ASSERT_TRUE(callback_->WaitForEvents(1, kWait));
    EXPECT_TRUE(Logged(ANDROID_LOG_INFO, "DisableInternal " + HandleAndMode()));
    WaitForIdleWorkers();
    EXPECT_TRUE(NotificationThreadEnded());
    EXPECT_EQ(callback_->Count(), 1u) << "nothing is delivered after the disable";

    // The client is disabled, not gone: it can be enabled again and receives events.
    callback_->SetReaction(nullptr);
    EnableOk(handle_, 1);
    EXPECT_TRUE(callback_->WaitForEvents(2, kWait));
}

TEST_F(NestedCallTest, DisableAndCloseFromOnEventRemoveTheClient) {
    callback_->SetReaction([this](size_t count) {
        if (count != 1) return;
        service_->Disable(handle_);
        service_->Close(handle_);
    });
    EnableOk(handle_, 1);
    ASSERT_TRUE(callback_->WaitForEvents(1, kWait));
    EXPECT_TRUE(Logged(ANDROID_LOG_INFO, "DisableInternal " + HandleAndMode()));
    WaitForIdleWorkers();
    EXPECT_TRUE(NotificationThreadEnded());
    Event event{};
    EXPECT_EQ(Poll(handle_, &event), -22) << "the handle is closed";
    // The table slot is free again: ten more clients fit.
    for (int i = 0; i < 10; ++i) OpenOk(kRange);
}

TEST_F(NestedCallTest, CloseFromOnEventKeepsTheEnableCountAsCloseAlwaysDoes) {
    callback_->SetReaction([this](size_t count) {
        if (count == 1) service_->Close(handle_);
    });
    EnableOk(handle_, 1);
    ASSERT_TRUE(callback_->WaitForEvents(1, kWait));
    EXPECT_TRUE(vyr_test::WaitForThreadCount(idle_threads_ + 1, kWait))
        << "the notification thread ends; sampling goes on for the enable left in force";
    Event event{};
    EXPECT_EQ(Poll(handle_, &event), -22);
    EXPECT_EQ(vyr_test::ServicePeer::SnapshotModeBlock(*service_, kRangeBlock).enable_count, 1);
    // What Close leaves behind is withdrawn as a disable item would; the fixture expects idle
    // workers at its end.
    vyr_test::ServicePeer::PushWorkItem(*service_, {false, kRange, handle_, 0});
}

TEST_F(NestedCallTest, EnableAfterANestedDisableStartsOneNewThread) {
    // The new thread may deliver before the nested Enable has returned to the old one.
    std::promise<int32_t> enable_result;
    std::future<int32_t> nested_result = enable_result.get_future();
    callback_->SetReaction([this, &enable_result](size_t count) {
        if (count != 1) return;
        service_->Disable(handle_);
        int32_t result = 1;
        service_->Enable(handle_, 1, &result);
        enable_result.set_value(result);
    });
    EnableOk(handle_, 1);
    ASSERT_TRUE(callback_->WaitForEvents(1, kWait));
    sensor_doubles::SetRangeData(Frame(9));
    ASSERT_TRUE(callback_->WaitForEvents(2, kWait)) << "the new notification thread delivers";
    ASSERT_EQ(nested_result.wait_for(kWait), std::future_status::ready);
    EXPECT_EQ(nested_result.get(), 0);
    EXPECT_EQ(log_.Count(kTag, ANDROID_LOG_INFO, "Enable " + HandleAndMode()), 2u);
    // The old thread has ended; one notification thread and the range worker remain.
    EXPECT_TRUE(vyr_test::WaitForThreadCount(idle_threads_ + 2, kWait))
        << "the processing thread and one notification thread";
    DisableNow(handle_);
    EXPECT_TRUE(NotificationThreadEnded());
}

}  // namespace
}  // namespace vyr_datapath
