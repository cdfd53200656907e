// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "client_processes.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <chrono>
#include <condition_variable>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "child_process.h"
#include "temp_dir.h"

namespace vyr_test::service {
namespace {

using android::vyr::binder::ClientEntry;
using android::vyr::binder::ClientProcesses;
using android::vyr::binder::ClientProcessWatcher;

constexpr std::chrono::seconds kDeadline{10};

class ClientProcessesTest : public ::testing::Test {
  protected:
    std::unique_ptr<ChildProcess> Sleeper() {
        std::unique_ptr<ChildProcess> child = StartSleeper(dir_.Path("stderr"));
        EXPECT_TRUE(child->started());
        return child;
    }
    bool WaitForExit(pid_t pid) {
        std::unique_lock<std::mutex> lock(mutex_);
        return cv_.wait_for(lock, kDeadline, [&] { return exited_.count(pid) != 0; });
    }

    TempDir dir_;
    std::mutex mutex_;
    std::condition_variable cv_;
    std::map<pid_t, ClientProcessWatcher::ProcessId> exited_;
    ClientProcesses processes_{[this](ClientProcessWatcher::ProcessId id, pid_t pid) {
        std::lock_guard<std::mutex> lock(mutex_);
        exited_.emplace(pid, id);
        cv_.notify_all();
    }};
};

TEST_F(ClientProcessesTest, TheServiceItselfAndAOnewayCallerCannotBeWatched) {
    ClientEntry::Users own;
    processes_.NoteProcess(&own, getpid());
    EXPECT_TRUE(own.unwatched);
    EXPECT_TRUE(own.processes.empty());

    ClientEntry::Users oneway;
    processes_.NoteProcess(&oneway, 0);
    EXPECT_TRUE(oneway.unwatched);
    EXPECT_EQ(processes_.WatchedCount(), 0u);
}

TEST_F(ClientProcessesTest, AnInProcessCallerIsNotedUnwatched) {
    ClientEntry::Users users;
    // Outside a binder call the calling pid is this process's own.
    processes_.NoteCaller(&users);
    EXPECT_TRUE(users.unwatched);
}

TEST_F(ClientProcessesTest, TheEndOfAWatchedUserIsReported) {
    auto child = Sleeper();
    ClientEntry::Users users;
    processes_.NoteProcess(&users, child->pid());
    ASSERT_EQ(users.processes.size(), 1u);
    EXPECT_EQ(users.processes.begin()->second, child->pid());
    EXPECT_FALSE(users.unwatched);
    EXPECT_EQ(processes_.WatchedCount(), 1u);

    child->Signal(SIGKILL);
    ASSERT_TRUE(WaitForExit(child->pid()));
    std::lock_guard<std::mutex> lock(mutex_);
    EXPECT_EQ(exited_.at(child->pid()), users.processes.begin()->first);
}

TEST_F(ClientProcessesTest, AProcessSharedWithAnotherClientIsStillWatchedWhenOneForgetsIt) {
    auto child = Sleeper();
    ClientProcesses::ClientTable clients;
    auto staying = std::make_shared<ClientEntry>(3);
    processes_.NoteProcess(&staying->users, child->pid());
    clients.emplace(7, staying);
    ClientEntry::Users leaving;
    processes_.NoteProcess(&leaving, child->pid());
    ASSERT_EQ(leaving.processes, staying->users.processes);

    processes_.Forget(leaving, clients);
    EXPECT_EQ(processes_.WatchedCount(), 1u);

    clients.clear();
    processes_.Forget(staying->users, clients);
    EXPECT_EQ(processes_.WatchedCount(), 0u);
    child->Signal(SIGKILL);
    ASSERT_TRUE(child->Wait(kDeadline).has_value());
    std::lock_guard<std::mutex> lock(mutex_);
    EXPECT_EQ(exited_.count(child->pid()), 0u) << "a forgotten process is not reported";
}

TEST_F(ClientProcessesTest, OnlyTheLastWatchedUserOfAnUnlinkedHandleEndsItsUse) {
    ClientEntry entry(1);
    entry.users.processes = {{1, 100}, {2, 200}};
    EXPECT_FALSE(ClientProcesses::EndsLastUse(&entry, 3)) << "not a user";
    EXPECT_FALSE(ClientProcesses::EndsLastUse(&entry, 1)) << "another user is left";
    EXPECT_TRUE(ClientProcesses::EndsLastUse(&entry, 2));
    EXPECT_TRUE(entry.users.processes.empty());
    EXPECT_FALSE(ClientProcesses::EndsLastUse(&entry, 2)) << "reported once";
}

TEST_F(ClientProcessesTest, AnUnwatchedUserOrALinkedCallbackKeepsTheHandle) {
    ClientEntry unwatched(1);
    unwatched.users.processes = {{1, 100}};
    unwatched.users.unwatched = true;
    EXPECT_FALSE(ClientProcesses::EndsLastUse(&unwatched, 1));

    ClientEntry linked(1);
    linked.users.processes = {{1, 100}};
    AIBinder_DeathRecipient* recipient = AIBinder_DeathRecipient_new([](void*) {});
    linked.death_recipient = recipient;
    EXPECT_FALSE(ClientProcesses::EndsLastUse(&linked, 1)) << "its death notice releases it";
    AIBinder_DeathRecipient_delete(recipient);
}

TEST_F(ClientProcessesTest, NoEndIsReportedAfterStop) {
    auto child = Sleeper();
    ClientEntry::Users users;
    processes_.NoteProcess(&users, child->pid());
    processes_.Stop();
    EXPECT_EQ(processes_.WatchedCount(), 0u);
    child->Signal(SIGKILL);
    ASSERT_TRUE(child->Wait(kDeadline).has_value());
    std::lock_guard<std::mutex> lock(mutex_);
    EXPECT_TRUE(exited_.empty());
}

}  // namespace
}  // namespace vyr_test::service
