// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// A notification thread let go by a nested Disable (from its own OnEvent) ends on its own once
// OnEvent returns. An Enable of the same client from another thread must never let it see the
// client enabled under its old generation: it would go on to the condition variable and mutex
// that this Enable is replacing. The program stops the enabling thread at the first allocation
// it makes once the client reads as enabled, lets the old thread go on from there, and waits for
// it to end. Its own operator new is what gives the test that point inside Enable.

#include <unistd.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdlib>
#include <mutex>
#include <new>
#include <string>
#include <thread>

#include "client_entry.h"
#include "data_path_fixture.h"
#include "vyrservice_test_peer.h"

namespace {

using android::vyr::binder::ClientEntry;
using android::vyr::binder::kClientEnabled;

// Run before every allocation of the thread that sets it.
thread_local void (*t_allocation_hook)() = nullptr;

struct Rendezvous {
    std::mutex mutex;
    std::condition_variable changed;
    pid_t let_go_tid = 0;
    bool disabled = false;
    bool go = false;
    bool let_go_ended = false;
};

Rendezvous* g_rendezvous = nullptr;
const ClientEntry* g_entry = nullptr;

bool TaskEnded(pid_t tid, std::chrono::milliseconds timeout) {
    const std::string path = "/proc/self/task/" + std::to_string(tid);
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (access(path.c_str(), F_OK) == 0) {
        if (std::chrono::steady_clock::now() >= deadline) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return true;
}

// Inside Enable, once the client reads as enabled: the old thread goes on, and Enable waits for
// it to end.
void LetTheOldThreadGoOn() {
    if (g_entry->state != kClientEnabled) return;
    t_allocation_hook = nullptr;
    pid_t tid = 0;
    {
        std::lock_guard<std::mutex> lock(g_rendezvous->mutex);
        g_rendezvous->go = true;
        tid = g_rendezvous->let_go_tid;
    }
    g_rendezvous->changed.notify_all();
    const bool ended = TaskEnded(tid, vyr_test::kWait);
    std::lock_guard<std::mutex> lock(g_rendezvous->mutex);
    g_rendezvous->let_go_ended = ended;
}

}  // namespace

void* operator new(std::size_t size) {
    if (t_allocation_hook != nullptr) t_allocation_hook();
    if (void* memory = std::malloc(size == 0 ? 1 : size)) return memory;
    throw std::bad_alloc();
}
void* operator new[](std::size_t size) {
    return operator new(size);
}
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    if (t_allocation_hook != nullptr) t_allocation_hook();
    return std::malloc(size == 0 ? 1 : size);
}
void* operator new[](std::size_t size, const std::nothrow_t& tag) noexcept {
    return operator new(size, tag);
}
void operator delete(void* memory) noexcept {
    std::free(memory);
}
void operator delete[](void* memory) noexcept {
    std::free(memory);
}
void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}
void operator delete[](void* memory, std::size_t) noexcept {
    std::free(memory);
}

namespace vyr_test::datapath {
namespace {

class EnableOrderTest : public DataPathTest {};

TEST_F(EnableOrderTest, ThreadLetGoByANestedDisableNeverSeesAHalfMadeEnable) {
    MakeService(false);
    sensor_doubles::SetRangeData(RangeFrame(7));
    const int32_t handle = Open(kRange);
    EXPECT_GT(handle, 0);
    auto callback = NewCallback();
    int32_t result = 1;
    ASSERT_TRUE(service_->SetCallback(handle, callback, &result).isOk());
    ASSERT_EQ(result, 0);
    const std::shared_ptr<ClientEntry> entry = vyr_test::ServicePeer::Entry(*service_, handle);

    Rendezvous rendezvous;
    g_rendezvous = &rendezvous;
    g_entry = entry.get();
    callback->SetReaction([this, handle, &rendezvous](size_t count) {
        if (count != 1) return;
        service_->Disable(handle);
        std::unique_lock<std::mutex> lock(rendezvous.mutex);
        rendezvous.let_go_tid = gettid();
        rendezvous.disabled = true;
        rendezvous.changed.notify_all();
        rendezvous.changed.wait_for(lock, kWait, [&] { return rendezvous.go; });
    });
    EXPECT_EQ(0, Enable(handle, 1));
    {
        std::unique_lock<std::mutex> lock(rendezvous.mutex);
        ASSERT_TRUE(rendezvous.changed.wait_for(lock, kWait, [&] { return rendezvous.disabled; }));
    }

    t_allocation_hook = &LetTheOldThreadGoOn;
    EXPECT_EQ(0, Enable(handle, 1));
    t_allocation_hook = nullptr;
    {
        std::lock_guard<std::mutex> lock(rendezvous.mutex);
        EXPECT_TRUE(rendezvous.go) << "Enable allocated nothing once the client was enabled";
        EXPECT_TRUE(rendezvous.let_go_ended) << "the old thread went on past its check";
    }
    // The new thread delivers as usual.
    EXPECT_TRUE(callback->WaitForEvents(2, kWait));
    callback->SetReaction(nullptr);
}

}  // namespace
}  // namespace vyr_test::datapath
