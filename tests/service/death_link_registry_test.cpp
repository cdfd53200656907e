// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "death_link_registry.h"

#include <android/binder_auto_utils.h>
#include <gtest/gtest.h>
#include <sys/types.h>

#include <memory>

#include "ignoring_callback.h"
#include "process_fixture.h"

namespace vyr_test::service {
namespace {

using android::vyr::binder::ClientEntry;
using android::vyr::binder::DeathCookie;
using android::vyr::binder::DeathLinkRegistry;
using binder::DeathLog;
using binder::Eventually;

// The registry against binders of other processes, which die when the test kills them.
class DeathLinkRegistryTest : public binder::CrossProcessTest {
  protected:
    // A client whose callback is the binder of a new server process.
    std::unique_ptr<ClientEntry> RemoteClient(const std::string& name, pid_t* pid) {
        auto entry = std::make_unique<ClientEntry>(3);
        auto server = StartServer(name, pid);
        EXPECT_NE(server, nullptr);
        if (server != nullptr) entry->callback_binder = server->asBinder();
        return entry;
    }
    // Whether every link of `registry` is freed once the runtime has reported it ended.
    static bool AllFreed(DeathLinkRegistry* registry) {
        return Eventually([registry] {
            registry->Sweep();
            return registry->Size() == 0;
        });
    }

    // Kills `pid`, the server of `binder`, with a new link to `binder` in place, which tells when
    // the notices have run: only that link gets one. A freed link's memory may be that link's
    // now, so the notice is told apart by being the only one, not by its cookie.
    void ExpectOnlyASentinelNotice(const ndk::SpAIBinder& binder, pid_t pid) {
        ClientEntry sentinel(3);
        sentinel.callback_binder = binder;
        registry_.Link(&sentinel);
        const void* sentinel_cookie = sentinel.death_cookie;
        Kill(pid);
        ASSERT_TRUE(DeathLog::Get().WaitFor(1));
        ASSERT_EQ(DeathLog::Get().notices().size(), 1u);
        EXPECT_EQ(DeathLog::Get().notices()[0].first, sentinel_cookie);
        DeathLinkRegistry::LetGo(&sentinel);
        EXPECT_TRUE(AllFreed(&registry_));
    }

    DeathLinkRegistry registry_{nullptr, &DeathLog::OnDied};
};

TEST_F(DeathLinkRegistryTest, TheDeathOfALinkedBinderDeliversItsCookieAndThenFreesTheLink) {
    pid_t pid = -1;
    std::unique_ptr<ClientEntry> entry = RemoteClient("vyr.test.dlr.death", &pid);
    registry_.Link(entry.get());
    ASSERT_NE(entry->death_cookie, nullptr);
    ASSERT_NE(entry->death_recipient, nullptr);
    EXPECT_EQ(entry->death_cookie->first, entry->callback_binder.get());
    const void* cookie = entry->death_cookie;
    EXPECT_EQ(registry_.Size(), 1u);

    Kill(pid);
    ASSERT_TRUE(DeathLog::Get().WaitFor(1));
    EXPECT_EQ(DeathLog::Get().CountOf(const_cast<void*>(cookie)), 1u);
    // As the death handler does: the link is let go, not removed.
    DeathLinkRegistry::LetGo(entry.get());
    EXPECT_EQ(entry->death_cookie, nullptr);
    EXPECT_TRUE(AllFreed(&registry_));
}

TEST_F(DeathLinkRegistryTest, AnUnlinkedLinkGetsNoNoticeAndIsFreed) {
    pid_t pid = -1;
    std::unique_ptr<ClientEntry> entry = RemoteClient("vyr.test.dlr.unlink", &pid);
    registry_.Link(entry.get());
    DeathLinkRegistry::Unlink(entry.get());
    EXPECT_EQ(entry->death_cookie, nullptr);
    EXPECT_EQ(entry->death_recipient, nullptr);
    EXPECT_TRUE(AllFreed(&registry_));

    ExpectOnlyASentinelNotice(entry->callback_binder, pid);
}

TEST_F(DeathLinkRegistryTest, ALinkThatCannotBeMadeIsRecordedNowhere) {
    ClientEntry entry(1);
    // A binder of this process: no death notice can come for it.
    entry.callback_binder = ndk::SharedRefBase::make<IgnoringCallback>()->asBinder();
    registry_.Link(&entry);
    EXPECT_EQ(entry.death_cookie, nullptr);
    EXPECT_EQ(entry.death_recipient, nullptr);
    // Reported unlinked during or shortly after the failed call, then freed by a sweep.
    EXPECT_TRUE(AllFreed(&registry_));
}

TEST_F(DeathLinkRegistryTest, ARegistryDestroyedWithLiveLinksLeavesNoNoticeBehind) {
    pid_t pid = -1;
    std::unique_ptr<ClientEntry> entry = RemoteClient("vyr.test.dlr.destroyed", &pid);
    {
        DeathLinkRegistry registry(nullptr, &DeathLog::OnDied);
        registry.Link(entry.get());
        ASSERT_NE(entry->death_cookie, nullptr);
    }
    ExpectOnlyASentinelNotice(entry->callback_binder, pid);
}

}  // namespace
}  // namespace vyr_test::service
