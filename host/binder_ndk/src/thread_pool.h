#pragma once

#include <condition_variable>
#include <cstdint>
#include <deque>
#include <functional>
#include <mutex>
#include <thread>
#include <vector>

namespace vyr_binder {

// The process's binder threads: incoming transactions that are not nested in a call of ours run
// here. Threads are started on demand once the pool is started, up to the maximum; threads that
// join the pool come on top of that.
class ThreadPool {
  public:
    static constexpr uint32_t kDefaultMaxThreads = 15;

    void Enqueue(std::function<void()> work);
    void Start();
    bool IsStarted() const;
    bool SetMaxThreads(uint32_t max_threads);
    // Serves until Shutdown.
    void Join();
    // Stops every thread and waits for them; queued work is dropped. Start works again after.
    void Shutdown();

  private:
    void SpawnLocked();
    void Serve(std::unique_lock<std::mutex>& lock);

    mutable std::mutex mutex_;
    std::condition_variable work_cv_;
    std::condition_variable joined_cv_;
    std::deque<std::function<void()>> queue_;
    std::vector<std::thread> threads_;
    uint32_t max_threads_ = kDefaultMaxThreads;
    uint32_t idle_ = 0;
    uint32_t joined_ = 0;
    bool started_ = false;
    bool stopping_ = false;
};

}  // namespace vyr_binder
