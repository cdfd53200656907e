// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <aidl/android/vyr/BpVYRService.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <gtest/gtest.h>
#include <unistd.h>
#include <vyr/binder_host.h>

#include "binder_test_env.h"
#include "test_service.h"

namespace vyr_test::binder {
namespace {

using aidl::android::vyr::BpVYRService;
using aidl::android::vyr::IVYRService;

TEST(InProcessTest, FromBinderOfLocalBinderIsTheLocalObject) {
    auto service = ndk::SharedRefBase::make<TestService>();
    ndk::SpAIBinder binder = service->asBinder();
    ASSERT_NE(nullptr, binder.get());
    EXPECT_FALSE(AIBinder_isRemote(binder.get()));
    EXPECT_TRUE(AIBinder_isAlive(binder.get()));
    EXPECT_EQ(STATUS_OK, AIBinder_ping(binder.get()));
    std::shared_ptr<IVYRService> back = IVYRService::fromBinder(binder);
    EXPECT_EQ(service.get(), back.get());
    EXPECT_FALSE(back->isRemote());
}

TEST(InProcessTest, AsBinderReturnsTheSameBinderWhileItLives) {
    auto service = ndk::SharedRefBase::make<TestService>();
    ndk::SpAIBinder first = service->asBinder();
    ndk::SpAIBinder second = service->asBinder();
    EXPECT_EQ(first.get(), second.get());
}

TEST(InProcessTest, BinderKeepsItsInterfaceAlive) {
    std::weak_ptr<TestService> weak;
    ndk::SpAIBinder binder;
    {
        auto service = ndk::SharedRefBase::make<TestService>();
        weak = service;
        binder = service->asBinder();
    }
    EXPECT_FALSE(weak.expired());
    binder.set(nullptr);
    EXPECT_TRUE(weak.expired());
}

TEST(InProcessTest, TransactOnLocalBinderCallsOnTransactDirectly) {
    auto service = ndk::SharedRefBase::make<TestService>();
    auto proxy = ndk::SharedRefBase::make<BpVYRService>(service->asBinder());
    int32_t result = 0;
    ASSERT_TRUE(proxy->Open(3, &result).isOk());
    EXPECT_EQ(30, result);
    ASSERT_TRUE(proxy->Enable(4, 100, &result).isOk());
    EXPECT_EQ(104, result);
    ASSERT_TRUE(proxy->EnableLowPower(1, true, &result).isOk());
    EXPECT_EQ(1, result);
    ASSERT_TRUE(proxy->ConfigureParameters(1, {1, 2, 3, 4}, &result).isOk());
    EXPECT_EQ(10, result);
    aidl::android::vyr::Event event;
    ASSERT_TRUE(proxy->PollOnce(5, &event, &result).isOk());
    EXPECT_EQ(getpid(), result);
    EXPECT_EQ(5, event.status);
    EXPECT_EQ(5u, event.data.size());
    ASSERT_TRUE(proxy->SetTorchLightState(2).isOk());
    EXPECT_EQ(2, service->last_torch_state());
    ndk::ScopedAStatus error = proxy->Disable(-4);
    EXPECT_EQ(EX_SERVICE_SPECIFIC, error.getExceptionCode());
    EXPECT_EQ(-4, error.getServiceSpecificError());
    EXPECT_STREQ("neg", error.getMessage());
}

TEST(InProcessTest, CallbackPassedInProcessIsTheLocalObject) {
    auto service = ndk::SharedRefBase::make<TestService>();
    auto proxy = ndk::SharedRefBase::make<BpVYRService>(service->asBinder());
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = 0;
    ASSERT_TRUE(proxy->SetCallback(2, callback, &result).isOk());
    EXPECT_EQ(2, result);
    EXPECT_EQ(callback.get(), service->callback().get());
    ASSERT_EQ(2u, callback->events().size());
}

TEST(InProcessTest, WrongInterfaceTokenIsBadType) {
    auto service = ndk::SharedRefBase::make<TestService>();
    ndk::SpAIBinder binder = service->asBinder();
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    // A parcel prepared for the callback's class, sent to the service.
    ndk::SpAIBinder callback_binder = callback->asBinder();
    AParcel* in = nullptr;
    ASSERT_EQ(STATUS_OK, AIBinder_prepareTransaction(callback_binder.get(), &in));
    AParcel* out = nullptr;
    EXPECT_EQ(STATUS_BAD_VALUE,
              AIBinder_transact(binder.get(), FIRST_CALL_TRANSACTION, &in, &out, 0));
    EXPECT_EQ(nullptr, in);

    // The right binder, but a token naming another interface.
    ASSERT_EQ(STATUS_OK, AIBinder_prepareTransaction(binder.get(), &in));
    ASSERT_EQ(STATUS_OK, AParcel_setDataPosition(in, 0));
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(in, 0));
    EXPECT_EQ(STATUS_BAD_TYPE,
              AIBinder_transact(binder.get(), FIRST_CALL_TRANSACTION, &in, &out, 0));
}

TEST(InProcessTest, UnknownCodeIsUnknownTransaction) {
    auto service = ndk::SharedRefBase::make<TestService>();
    ndk::SpAIBinder binder = service->asBinder();
    AParcel* in = nullptr;
    AParcel* out = nullptr;
    ASSERT_EQ(STATUS_OK, AIBinder_prepareTransaction(binder.get(), &in));
    EXPECT_EQ(STATUS_UNKNOWN_TRANSACTION,
              AIBinder_transact(binder.get(), FIRST_CALL_TRANSACTION + 100, &in, &out, 0));
}

void NeverCalled(void*) {
    ADD_FAILURE() << "a local binder never dies";
}

TEST(InProcessTest, DeathLinksOnLocalBinderAreRefused) {
    auto service = ndk::SharedRefBase::make<TestService>();
    ndk::SpAIBinder binder = service->asBinder();
    ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(NeverCalled));
    int cookie = 0;
    EXPECT_EQ(STATUS_INVALID_OPERATION,
              AIBinder_linkToDeath(binder.get(), recipient.get(), &cookie));
    EXPECT_EQ(STATUS_NAME_NOT_FOUND, AIBinder_unlinkToDeath(binder.get(), recipient.get(), &cookie));
    EXPECT_EQ(STATUS_UNEXPECTED_NULL, AIBinder_linkToDeath(nullptr, recipient.get(), &cookie));
}

TEST(InProcessTest, ServiceLookedUpInItsOwnProcessIsTheLocalObject) {
    vyr_test::binder::ScopedRegistryDir registry;
    auto service = ndk::SharedRefBase::make<TestService>();
    ASSERT_EQ(EX_NONE, AServiceManager_addService(service->asBinder().get(), "inprocess.test"));
    ndk::SpAIBinder found(AServiceManager_checkService("inprocess.test"));
    ASSERT_NE(nullptr, found.get());
    EXPECT_EQ(service.get(), IVYRService::fromBinder(found).get());
    ndk::SpAIBinder got(AServiceManager_waitForService("inprocess.test"));
    EXPECT_EQ(found.get(), got.get());
    EXPECT_NE(EX_NONE, AServiceManager_addService(service->asBinder().get(), "bad name!"));
    EXPECT_NE(EX_NONE, AServiceManager_addService(nullptr, "inprocess.null"));
    VyrBinder_shutdown();
}

TEST(InProcessTest, WeakReferencePromotesOnlyWhileAlive) {
    auto service = ndk::SharedRefBase::make<TestService>();
    ndk::SpAIBinder strong = service->asBinder();
    ndk::ScopedAIBinder_Weak weak(AIBinder_Weak_new(strong.get()));
    EXPECT_EQ(strong.get(), weak.promote().get());
    strong.set(nullptr);
    EXPECT_EQ(nullptr, weak.promote().get());
}

TEST(InProcessTest, StatusHelpers) {
    ndk::ScopedAStatus ok = ndk::ScopedAStatus::ok();
    EXPECT_TRUE(ok.isOk());
    EXPECT_EQ(STATUS_OK, ok.getStatus());
    ndk::ScopedAStatus dead = ndk::ScopedAStatus::fromStatus(STATUS_DEAD_OBJECT);
    EXPECT_FALSE(dead.isOk());
    EXPECT_EQ(EX_TRANSACTION_FAILED, dead.getExceptionCode());
    EXPECT_EQ(STATUS_DEAD_OBJECT, dead.getStatus());
    ndk::ScopedAStatus specific = ndk::ScopedAStatus::fromServiceSpecificError(9);
    EXPECT_EQ(9, specific.getServiceSpecificError());
    EXPECT_STREQ("", specific.getMessage());
    EXPECT_NE(std::string::npos, specific.getDescription().find("EX_SERVICE_SPECIFIC"));
    EXPECT_TRUE(ndk::ScopedAStatus::fromStatus(STATUS_OK).isOk());
}

}  // namespace
}  // namespace vyr_test::binder
