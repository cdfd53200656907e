// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The binder NDK's contracts that the service and the client library rely on, checked across
// processes through the NDK alone: the same tests run against a device's libbinder_ndk.

#include <aidl/android/vyr/IVYRService.h>
#include <android/binder_manager.h>
#include <android/binder_parcel_utils.h>
#include <android/binder_process.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "echo_binder.h"
#include "process_fixture.h"
#include "test_descriptors.h"
#include "test_service.h"

namespace vyr_test::binder {
namespace {

using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;
using aidl::android::vyr::IVYRService;
using namespace std::chrono_literals;

// A oneway transaction of int32 arguments, as a generated proxy sends one.
binder_status_t Oneway(AIBinder* binder, transaction_code_t code, const std::vector<int32_t>& args) {
    AParcel* in = nullptr;
    binder_status_t status = AIBinder_prepareTransaction(binder, &in);
    if (status != STATUS_OK) return status;
    for (int32_t arg : args) AParcel_writeInt32(in, arg);
    AParcel* out = nullptr;
    status = AIBinder_transact(binder, code, &in, &out, FLAG_ONEWAY);
    AParcel_delete(out);
    return status;
}

// Cookies that onUnlinked reported, in order.
std::vector<void*>& UnlinkedCookies() {
    static std::vector<void*> cookies;
    return cookies;
}
void RecordUnlinked(void* cookie) {
    UnlinkedCookies().push_back(cookie);
}
void IgnoreDeath(void* /*cookie*/) {}

// A link that could not be made is reported unlinked inside the failing call, with the
// onUnlinked in force when the link was tried.
TEST(NdkContractTest, AFailedLinkIsReportedUnlinkedBeforeItReturns) {
    auto service = ndk::SharedRefBase::make<TestService>();
    ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(&IgnoreDeath));
    AIBinder_DeathRecipient_setOnUnlinked(recipient.get(), &RecordUnlinked);
    UnlinkedCookies().clear();
    int cookie = 0;
    EXPECT_EQ(STATUS_INVALID_OPERATION,
              AIBinder_linkToDeath(service->asBinder().get(), recipient.get(), &cookie));
    EXPECT_EQ(UnlinkedCookies(), std::vector<void*>{&cookie});
    AIBinder_DeathRecipient_setOnUnlinked(recipient.get(), nullptr);
    EXPECT_EQ(STATUS_INVALID_OPERATION,
              AIBinder_linkToDeath(service->asBinder().get(), recipient.get(), &cookie));
    EXPECT_EQ(UnlinkedCookies().size(), 1u);
}

// The binders that registration notices reported.
class Registrations {
  public:
    static void OnRegister(const char* instance, AIBinder* registered, void* cookie) {
        auto* self = static_cast<Registrations*>(cookie);
        std::lock_guard<std::mutex> lock(self->mutex_);
        self->names_.push_back(instance);
        // The notice hands over a reference.
        self->binders_.emplace_back(registered);
        self->cv_.notify_all();
    }
    bool WaitFor(size_t count) {
        std::unique_lock<std::mutex> lock(mutex_);
        return cv_.wait_for(lock, 10s, [&] { return binders_.size() >= count; });
    }
    size_t Count() {
        std::lock_guard<std::mutex> lock(mutex_);
        return binders_.size();
    }
    ndk::SpAIBinder At(size_t index) {
        std::lock_guard<std::mutex> lock(mutex_);
        return binders_.at(index);
    }
    std::string NameAt(size_t index) {
        std::lock_guard<std::mutex> lock(mutex_);
        return names_.at(index);
    }

  private:
    std::mutex mutex_;
    std::condition_variable cv_;
    std::vector<std::string> names_;
    std::vector<ndk::SpAIBinder> binders_;
};

TEST_F(CrossProcessTest, PeerDeathNotifiesEveryLinkOnceWithItsCookie) {
    pid_t pid = -1;
    std::shared_ptr<IVYRService> service = StartServer("vyr.test", &pid);
    ASSERT_NE(nullptr, service);
    AIBinder* binder = service->asBinder().get();
    ndk::ScopedAIBinder_DeathRecipient first(AIBinder_DeathRecipient_new(DeathLog::OnDied));
    ndk::ScopedAIBinder_DeathRecipient second(AIBinder_DeathRecipient_new(DeathLog::OnDied));
    int cookies[3];
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, first.get(), &cookies[0]));
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, first.get(), &cookies[1]));
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, second.get(), &cookies[2]));
    ndk::SpAIBinder echo = WaitForService("vyr.test.echo");

    Kill(pid);
    ASSERT_TRUE(DeathLog::Get().WaitFor(3));
    // Nothing more arrives.
    EXPECT_FALSE(DeathLog::Get().WaitFor(4, 200ms));
    for (int& cookie : cookies) EXPECT_EQ(1u, DeathLog::Get().CountOf(&cookie));
    for (const auto& notice : DeathLog::Get().notices()) {
        EXPECT_NE(std::this_thread::get_id(), notice.second);
    }
    EXPECT_FALSE(AIBinder_isAlive(binder));
    EXPECT_FALSE(AIBinder_isAlive(echo.get()));
    int32_t result = 0;
    EXPECT_EQ(STATUS_DEAD_OBJECT, service->Open(1, &result).getStatus());
    EXPECT_EQ(STATUS_DEAD_OBJECT, AIBinder_ping(binder));
    EXPECT_EQ(STATUS_DEAD_OBJECT, AIBinder_linkToDeath(binder, first.get(), &cookies[0]));
}

// What the two links of UnlinkingALinkWhoseNoticeHasNotComeRemovesIt did, in order.
struct NoticeOrder {
    std::mutex mutex;
    std::condition_variable changed;
    std::vector<std::string> steps;
    AIBinder* binder = nullptr;
    AIBinder_DeathRecipient* second = nullptr;
    int cookies[2] = {0, 0};

    static NoticeOrder& Get() {
        static NoticeOrder order;
        return order;
    }
    void Add(const std::string& step) {
        {
            std::lock_guard<std::mutex> lock(mutex);
            steps.push_back(step);
        }
        changed.notify_all();
    }
    std::string Name(void* cookie) { return cookie == &cookies[0] ? "1" : "2"; }
    static void OnDied(void* cookie) {
        NoticeOrder& order = Get();
        order.Add("died" + order.Name(cookie));
        if (cookie != &order.cookies[0]) return;
        const binder_status_t status =
            AIBinder_unlinkToDeath(order.binder, order.second, &order.cookies[1]);
        order.Add("unlink2=" + std::to_string(status));
    }
    static void OnUnlinked(void* cookie) {
        NoticeOrder& order = Get();
        order.Add("unlinked" + order.Name(cookie));
    }
};

// A link removed while the notices of its binder's death run gets no notice of its own: the
// unlink answers STATUS_DEAD_OBJECT (libbinder's obituaries are sent), yet removes it, and its
// onUnlinked runs inside the unlink (ibinder.cpp, BpBinder.cpp).
TEST_F(CrossProcessTest, UnlinkingALinkWhoseNoticeHasNotComeRemovesIt) {
    pid_t pid = -1;
    std::shared_ptr<IVYRService> service = StartServer("vyr.test", &pid);
    ASSERT_NE(nullptr, service);
    NoticeOrder& order = NoticeOrder::Get();
    order.binder = service->asBinder().get();
    ndk::ScopedAIBinder_DeathRecipient first(AIBinder_DeathRecipient_new(&NoticeOrder::OnDied));
    ndk::ScopedAIBinder_DeathRecipient second(AIBinder_DeathRecipient_new(&NoticeOrder::OnDied));
    AIBinder_DeathRecipient_setOnUnlinked(first.get(), &NoticeOrder::OnUnlinked);
    AIBinder_DeathRecipient_setOnUnlinked(second.get(), &NoticeOrder::OnUnlinked);
    order.second = second.get();
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(order.binder, first.get(), &order.cookies[0]));
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(order.binder, second.get(), &order.cookies[1]));

    Kill(pid);
    const std::vector<std::string> expected = {
        "died1", "unlinked2", "unlink2=" + std::to_string(STATUS_DEAD_OBJECT), "unlinked1"};
    std::unique_lock<std::mutex> lock(order.mutex);
    ASSERT_TRUE(order.changed.wait_for(lock, 10s, [&] { return order.steps.size() >= 4; }));
    // Nothing more arrives.
    EXPECT_FALSE(order.changed.wait_for(lock, 200ms, [&] { return order.steps.size() > 4; }));
    EXPECT_EQ(order.steps, expected);
}

TEST_F(CrossProcessTest, UnlinkedRecipientsAreNotNotified) {
    pid_t pid = -1;
    std::shared_ptr<IVYRService> service = StartServer("vyr.test", &pid);
    ASSERT_NE(nullptr, service);
    AIBinder* binder = service->asBinder().get();
    ndk::ScopedAIBinder_DeathRecipient exact(AIBinder_DeathRecipient_new(DeathLog::OnDied));
    ndk::ScopedAIBinder_DeathRecipient by_null(AIBinder_DeathRecipient_new(DeathLog::OnDied));
    AIBinder_DeathRecipient* deleted = AIBinder_DeathRecipient_new(DeathLog::OnDied);
    ndk::ScopedAIBinder_DeathRecipient kept(AIBinder_DeathRecipient_new(DeathLog::OnDied));
    int cookies[5];
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, exact.get(), &cookies[0]));
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, by_null.get(), &cookies[1]));
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, by_null.get(), &cookies[2]));
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, deleted, &cookies[3]));
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, kept.get(), &cookies[4]));

    EXPECT_EQ(STATUS_NAME_NOT_FOUND, AIBinder_unlinkToDeath(binder, exact.get(), &cookies[1]));
    EXPECT_EQ(STATUS_OK, AIBinder_unlinkToDeath(binder, exact.get(), &cookies[0]));
    EXPECT_EQ(STATUS_NAME_NOT_FOUND, AIBinder_unlinkToDeath(binder, exact.get(), &cookies[0]));
    // A null cookie matches only a link made with a null cookie: it removes nothing here.
    EXPECT_EQ(STATUS_NAME_NOT_FOUND, AIBinder_unlinkToDeath(binder, by_null.get(), nullptr));
    EXPECT_EQ(STATUS_OK, AIBinder_unlinkToDeath(binder, by_null.get(), &cookies[1]));
    EXPECT_EQ(STATUS_OK, AIBinder_unlinkToDeath(binder, by_null.get(), &cookies[2]));
    AIBinder_DeathRecipient_delete(deleted);

    Kill(pid);
    ASSERT_TRUE(DeathLog::Get().WaitFor(1));
    EXPECT_FALSE(DeathLog::Get().WaitFor(2, 200ms));
    EXPECT_EQ(1u, DeathLog::Get().CountOf(&cookies[4]));
    // Once its notice has run, the link is gone.
    EXPECT_TRUE(Eventually([&] {
        return AIBinder_unlinkToDeath(binder, kept.get(), &cookies[4]) == STATUS_NAME_NOT_FOUND;
    }));
}

// A oneway call carries no sender pid on a device; a two-way one does.
TEST_F(CrossProcessTest, TheCallingPidOfAOnewayCallIsZero) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    ASSERT_TRUE(service->SetTorchLightState(5).isOk());
    int32_t caller = -1;
    ASSERT_TRUE(service->Open(TestService::kQueryTorchCaller, &caller).isOk());
    EXPECT_EQ(getpid(), caller);
    // SetTorchLightState, the interface's ninth method, sent oneway.
    ASSERT_EQ(STATUS_OK, Oneway(service->asBinder().get(), FIRST_CALL_TRANSACTION + 8, {6}));
    ASSERT_TRUE(Eventually([&] {
        int32_t torch = 0;
        return service->Open(TestService::kQueryTorch, &torch).isOk() && torch == 6;
    }));
    ASSERT_TRUE(service->Open(TestService::kQueryTorchCaller, &caller).isOk());
    EXPECT_EQ(0, caller);
}

std::atomic<int> g_unlinked_first{0};
std::atomic<int> g_unlinked_second{0};

// onUnlinked is taken when a link is made: a later setOnUnlinked reaches only later links.
TEST_F(CrossProcessTest, OnUnlinkedIsTheOneInForceWhenTheLinkWasMade) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    AIBinder* binder = service->asBinder().get();
    ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(DeathLog::OnDied));
    AIBinder_DeathRecipient_setOnUnlinked(recipient.get(), [](void*) { ++g_unlinked_first; });
    int cookies[2];
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, recipient.get(), &cookies[0]));
    AIBinder_DeathRecipient_setOnUnlinked(recipient.get(), [](void*) { ++g_unlinked_second; });
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, recipient.get(), &cookies[1]));
    ASSERT_EQ(STATUS_OK, AIBinder_unlinkToDeath(binder, recipient.get(), &cookies[0]));
    EXPECT_EQ(1, g_unlinked_first.load());
    EXPECT_EQ(0, g_unlinked_second.load());
    ASSERT_EQ(STATUS_OK, AIBinder_unlinkToDeath(binder, recipient.get(), &cookies[1]));
    EXPECT_EQ(1, g_unlinked_first.load());
    EXPECT_EQ(1, g_unlinked_second.load());
}

TEST_F(CrossProcessTest, ANullCookieUnlinksOnlyALinkMadeWithANullCookie) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    AIBinder* binder = service->asBinder().get();
    ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(DeathLog::OnDied));
    int cookie = 0;
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, recipient.get(), &cookie));
    EXPECT_EQ(STATUS_NAME_NOT_FOUND, AIBinder_unlinkToDeath(binder, recipient.get(), nullptr));
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, recipient.get(), nullptr));
    EXPECT_EQ(STATUS_OK, AIBinder_unlinkToDeath(binder, recipient.get(), nullptr));
    EXPECT_EQ(STATUS_OK, AIBinder_unlinkToDeath(binder, recipient.get(), &cookie));
}

// A oneway call's sender learns at once whether the receiver's transaction buffer took it. Calls
// queued behind a blocked one fill the oneway half; the next is refused with FAILED_TRANSACTION,
// and the connection, and two-way calls, go on.
TEST_F(CrossProcessTest, AOnewayFloodIsRefusedAndTheConnectionServesOn) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    AIBinder* binder = service->asBinder().get();
    const auto oneway = [binder](transaction_code_t code, const std::vector<int32_t>& args) {
        return Oneway(binder, code, args);
    };
    // EnableLowPower(kBlockForever, true): every later oneway call to the object waits behind it.
    ASSERT_EQ(STATUS_OK, oneway(FIRST_CALL_TRANSACTION + 5, {TestService::kBlockForever, 1}));
    binder_status_t status = STATUS_OK;
    int accepted = 0;
    while (accepted < 200000) {
        status = oneway(FIRST_CALL_TRANSACTION, {1});
        if (status != STATUS_OK) break;
        ++accepted;
    }
    EXPECT_EQ(STATUS_FAILED_TRANSACTION, status) << accepted << " calls accepted";
    EXPECT_GT(accepted, 1000);
    EXPECT_TRUE(AIBinder_isAlive(binder));
    int32_t result = 0;
    EXPECT_TRUE(service->SetTorchLightState(3).isOk());
    EXPECT_TRUE(service->Open(TestService::kQueryTorch, &result).isOk());
    EXPECT_EQ(3, result);
    EXPECT_EQ(STATUS_FAILED_TRANSACTION, oneway(FIRST_CALL_TRANSACTION, {1}));
}

TEST_F(CrossProcessTest, ClientDeathIsSeenByTheService) {
    auto service = ndk::SharedRefBase::make<TestService>();
    ASSERT_EQ(EX_NONE, AServiceManager_addService(service->asBinder().get(), "vyr.local"));
    pid_t pid = Spawn("client", "vyr.local");
    ASSERT_TRUE(Eventually([&] { return service->callback() != nullptr; }));
    std::shared_ptr<IEventCallback> callback = service->callback();
    EXPECT_TRUE(callback->isRemote());
    ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(DeathLog::OnDied));
    int cookie = 0;
    AIBinder* binder = callback->asBinder().get();
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder, recipient.get(), &cookie));
    ASSERT_TRUE(service->Close(2).isOk());
    Kill(pid);
    ASSERT_TRUE(DeathLog::Get().WaitFor(1));
    EXPECT_EQ(1u, DeathLog::Get().CountOf(&cookie));
    EXPECT_EQ(STATUS_DEAD_OBJECT, callback->OnEvent(Event()).getStatus());
}

TEST_F(CrossProcessTest, ProcessWithoutPoolGetsOnlyNestedCalls) {
    auto service = ndk::SharedRefBase::make<TestService>();
    ASSERT_EQ(EX_NONE, AServiceManager_addService(service->asBinder().get(), "vyr.local"));
    pid_t pid = Spawn("nopool", "vyr.local");
    ASSERT_GT(pid, 0);
    int status = -1;
    ASSERT_EQ(pid, waitpid(pid, &status, 0));
    children_.clear();
    ASSERT_TRUE(WIFEXITED(status));
    EXPECT_EQ(0, WEXITSTATUS(status));
}

TEST_F(CrossProcessTest, TransactionsOverOneMebibyteAreRefused) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    int32_t result = 0;
    std::vector<int32_t> big(300 * 1024, 1);
    ndk::ScopedAStatus status = service->ConfigureParameters(1, big, &result);
    EXPECT_EQ(STATUS_FAILED_TRANSACTION, status.getStatus());
    std::vector<int32_t> fits(200 * 1024, 1);
    ASSERT_TRUE(service->ConfigureParameters(1, fits, &result).isOk());
    EXPECT_EQ(200 * 1024, result);
}

TEST_F(CrossProcessTest, RegistrationNoticesComeForEachNewRegistrationUntilDeleted) {
    pid_t pid = -1;
    ASSERT_NE(nullptr, StartServer("vyr.test", &pid));
    Registrations seen;
    AServiceManager_NotificationRegistration* registration =
        AServiceManager_registerForServiceNotifications("vyr.test", &Registrations::OnRegister,
                                                        &seen);
    ASSERT_NE(nullptr, registration);
    ASSERT_TRUE(seen.WaitFor(1)) << "the registration in place is reported";
    EXPECT_EQ("vyr.test", seen.NameAt(0));
    Kill(pid);
    Spawn("serve", "vyr.test");
    ASSERT_TRUE(seen.WaitFor(2)) << "a new registration is reported";
    EXPECT_NE(seen.At(0).get(), seen.At(1).get());
    EXPECT_EQ(STATUS_OK, AIBinder_ping(seen.At(1).get()));
    AServiceManager_NotificationRegistration_delete(registration);
    const size_t reported = seen.Count();
    Kill(children_.back());
    Spawn("serve", "vyr.test");
    ASSERT_NE(nullptr, WaitForService("vyr.test").get());
    EXPECT_EQ(reported, seen.Count()) << "a deleted registration reported a registration";
    EXPECT_EQ(nullptr, AServiceManager_registerForServiceNotifications(
                           "bad name", &Registrations::OnRegister, &seen));
}

TEST_F(CrossProcessTest, EveryProcessHoldingAServiceIsToldOfItsDeath) {
    pid_t server = -1;
    std::shared_ptr<IVYRService> service = StartServer("vyr.test", &server);
    ASSERT_NE(nullptr, service);
    const pid_t watcher = Spawn("watch", "vyr.test");
    const std::string marker = registry_.path() + "/vyr.test.linked." + std::to_string(watcher);
    ASSERT_TRUE(Eventually([&] { return access(marker.c_str(), F_OK) == 0; }))
        << "the other client never linked";
    ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(DeathLog::OnDied));
    int cookie = 0;
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(service->asBinder().get(), recipient.get(), &cookie));
    Kill(server);
    EXPECT_TRUE(DeathLog::Get().WaitFor(1));
    int status = -1;
    ASSERT_TRUE(Eventually([&] { return waitpid(watcher, &status, WNOHANG) == watcher; }))
        << "the other client was not told";
    children_.erase(std::find(children_.begin(), children_.end(), watcher));
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
}

// As servicemanager does, a registration replaces the one before it, of a live process too.
// Death notices are work for the binder thread pool: a process without one hears of no death
// until it starts one, as on a device.
TEST_F(CrossProcessTest, AProcessWithoutAPoolGetsTheDeathNoticeOnceItStartsOne) {
    pid_t server = -1;
    ASSERT_NE(nullptr, StartServer("vyr.test", &server));
    const pid_t watcher = Spawn("latepool", "vyr.test");
    const std::string marker = registry_.path() + "/vyr.test.linked." + std::to_string(watcher);
    ASSERT_TRUE(Eventually([&] { return access(marker.c_str(), F_OK) == 0; }))
        << "the other client never linked";
    Kill(server);
    int status = -1;
    ASSERT_TRUE(Eventually([&] { return waitpid(watcher, &status, WNOHANG) == watcher; }, 20s));
    children_.erase(std::find(children_.begin(), children_.end(), watcher));
    ASSERT_TRUE(WIFEXITED(status)) << status;
    EXPECT_EQ(0, WEXITSTATUS(status)) << "5: a notice came without a pool; 6: none came with one";
}

TEST_F(CrossProcessTest, ARegistrationReplacesTheOneBefore) {
    pid_t pid = -1;
    std::shared_ptr<IVYRService> first = StartServer("vyr.test", &pid);
    ASSERT_NE(nullptr, first);
    auto mine = ndk::SharedRefBase::make<TestService>();
    EXPECT_EQ(EX_NONE, AServiceManager_addService(mine->asBinder().get(), "vyr.test"));
    ndk::SpAIBinder found(AServiceManager_checkService("vyr.test"));
    EXPECT_EQ(mine.get(), IVYRService::fromBinder(found).get());
    // The first one still serves whoever holds it.
    int32_t result = 0;
    EXPECT_TRUE(first->Open(2, &result).isOk());
    Kill(pid);
    found = ndk::SpAIBinder(AServiceManager_checkService("vyr.test"));
    EXPECT_EQ(mine.get(), IVYRService::fromBinder(found).get());
}

TEST_F(CrossProcessTest, NestedCallbacksDuringACallDoNotDeadlock) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = 0;
    // The service calls OnEvent three times while this thread waits for SetCallback's reply.
    ASSERT_TRUE(service->SetCallback(3, callback, &result).isOk());
    EXPECT_EQ(3, result);
    std::vector<Event> events = callback->events();
    ASSERT_EQ(3u, events.size());
    EXPECT_EQ(2, events[2].status);
    EXPECT_EQ(std::vector<float>(2, 0.5f), events[2].data);
}

TEST_F(CrossProcessTest, CallInFlightFailsAtOnceWhenThePeerDies) {
    pid_t pid = -1;
    std::shared_ptr<IVYRService> service = StartServer("vyr.test", &pid);
    ASSERT_NE(nullptr, service);
    std::atomic<binder_status_t> status{STATUS_OK};
    std::atomic<bool> returned{false};
    std::thread caller([&] {
        int32_t result = 0;
        status = service->EnableLowPower(TestService::kBlockForever, true, &result).getStatus();
        returned = true;
    });
    // The call is being served once the blocking method holds a pool thread; a ping still
    // goes through on another one.
    EXPECT_EQ(STATUS_OK, AIBinder_ping(service->asBinder().get()));
    std::this_thread::sleep_for(50ms);
    EXPECT_FALSE(returned.load());
    Kill(pid);
    EXPECT_TRUE(Eventually([&] { return returned.load(); }, 5s));
    caller.join();
    EXPECT_EQ(STATUS_DEAD_OBJECT, status.load());
}

// The helper's echo binder, associated with its class for transactions; null if it is not one.
ndk::SpAIBinder EchoOf(const ndk::SpAIBinder& binder) {
    if (binder.get() == nullptr || !AIBinder_associateClass(binder.get(), EchoClass())) {
        return ndk::SpAIBinder();
    }
    return binder;
}

// What a pipe's reader gets until every writer has closed its end; "timed out" after 10 s.
std::string ReadUntilClosed(int fd) {
    std::string text;
    const auto deadline = std::chrono::steady_clock::now() + 10s;
    for (;;) {
        const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
            deadline - std::chrono::steady_clock::now());
        pollfd readable{fd, POLLIN, 0};
        if (left.count() <= 0 || poll(&readable, 1, static_cast<int>(left.count())) <= 0) {
            return "timed out after \"" + text + "\"";
        }
        char buffer[256];
        const ssize_t n = read(fd, buffer, sizeof(buffer));
        if (n <= 0) return text;
        text.append(buffer, static_cast<size_t>(n));
    }
}

// A descriptor in a call reaches the other process as a working duplicate of the sender's, and
// one in the reply comes back the same way; the sender's stays its own (binder_parcel.h: "This
// does not take ownership of fd"; "The returned fd must be closed").
TEST_F(CrossProcessTest, ADescriptorInACallAndInItsReplyIsAWorkingDuplicate) {
    ASSERT_NE(nullptr, StartServer("vyr.test"));
    ndk::SpAIBinder echo = EchoOf(WaitForService("vyr.test.echo"));
    ASSERT_NE(nullptr, echo.get());
    const std::string text = "written by " + std::to_string(getpid()) + "\n";
    ndk::ScopedFileDescriptor file = MakeTextFile("vyr.echo.test", text);
    ASSERT_GE(file.get(), 0);
    AParcel* in = nullptr;
    ASSERT_EQ(STATUS_OK, AIBinder_prepareTransaction(echo.get(), &in));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeNullableParcelFileDescriptor(in, file));
    ndk::ScopedAParcel reply;
    ASSERT_EQ(STATUS_OK, AIBinder_transact(echo.get(), kEchoDescriptor, &in, reply.getR(), 0));
    std::string read_there;
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readString(reply.get(), &read_there));
    EXPECT_EQ(text, read_there) << "what the other process read through its duplicate";
    ndk::ScopedFileDescriptor back;
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readNullableParcelFileDescriptor(reply.get(), &back));
    ASSERT_GE(back.get(), 0);
    EXPECT_NE(file.get(), back.get());
    EXPECT_NE(0, fcntl(back.get(), F_GETFD) & FD_CLOEXEC);
    // The same open file, offset and all: what is written through one is read through the other.
    ASSERT_EQ(4, write(back.get(), "back", 4));
    EXPECT_EQ(text + "back", ReadText(file.get()));

    // A null one crosses as null.
    ASSERT_EQ(STATUS_OK, AIBinder_prepareTransaction(echo.get(), &in));
    ASSERT_EQ(STATUS_OK, AParcel_writeParcelFileDescriptor(in, -1));
    ndk::ScopedAParcel null_reply;
    ASSERT_EQ(STATUS_OK, AIBinder_transact(echo.get(), kEchoDescriptor, &in, null_reply.getR(), 0));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readString(null_reply.get(), &read_there));
    EXPECT_EQ("", read_there);
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readNullableParcelFileDescriptor(null_reply.get(), &back));
    EXPECT_EQ(-1, back.get());
}

// A oneway call carries its descriptor too. The pipe reaches its end once the other process has
// closed every copy it was given: its parcel's and the one it read.
TEST_F(CrossProcessTest, ADescriptorInAOnewayCallIsUsedAndClosedByTheReceiver) {
    ASSERT_NE(nullptr, StartServer("vyr.test"));
    ndk::SpAIBinder echo = EchoOf(WaitForService("vyr.test.echo"));
    ASSERT_NE(nullptr, echo.get());
    int ends[2];
    ASSERT_EQ(0, pipe2(ends, O_CLOEXEC));
    ndk::ScopedFileDescriptor reader(ends[0]);
    ndk::ScopedFileDescriptor writer(ends[1]);
    AParcel* in = nullptr;
    ASSERT_EQ(STATUS_OK, AIBinder_prepareTransaction(echo.get(), &in));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeRequiredParcelFileDescriptor(in, writer));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeString(in, std::string("oneway\n")));
    AParcel* out = nullptr;
    ASSERT_EQ(STATUS_OK, AIBinder_transact(echo.get(), kWriteToDescriptor, &in, &out, FLAG_ONEWAY));
    AParcel_delete(out);
    writer.set(-1);
    EXPECT_EQ("oneway\n", ReadUntilClosed(reader.get()));
}

// The generated code hands back the descriptor of an out ParcelFileDescriptor that the service
// set, and -1 for one it left null.
TEST_F(CrossProcessTest, EnableRingHandsBackTheServicesDescriptorInItsReply) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    ndk::ScopedFileDescriptor ring;
    int32_t result = -1;
    ASSERT_TRUE(service->EnableRing(3, 20, &ring, &result).isOk());
    EXPECT_EQ(0, result);
    ASSERT_GE(ring.get(), 0);
    EXPECT_EQ(TestService::RingText(3, 20), ReadText(ring.get()));
    ndk::ScopedFileDescriptor none;
    ASSERT_TRUE(service->EnableRing(-1, 20, &none, &result).isOk());
    EXPECT_EQ(-38, result);
    EXPECT_EQ(-1, none.get());
}

}  // namespace
}  // namespace vyr_test::binder
