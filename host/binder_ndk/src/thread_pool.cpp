#include "thread_pool.h"

#include <utility>

namespace vyr_binder {

void ThreadPool::Enqueue(std::function<void()> work) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (stopping_) return;
    queue_.push_back(std::move(work));
    if (idle_ > 0) {
        work_cv_.notify_one();
    } else if (started_ && threads_.size() < max_threads_) {
        SpawnLocked();
    }
}

void ThreadPool::Start() {
    std::lock_guard<std::mutex> lock(mutex_);
    if (started_ || stopping_) return;
    started_ = true;
    SpawnLocked();
}

bool ThreadPool::IsStarted() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return started_;
}

bool ThreadPool::SetMaxThreads(uint32_t max_threads) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (started_) return false;
    max_threads_ = max_threads;
    return true;
}

void ThreadPool::SpawnLocked() {
    if (max_threads_ == 0) return;
    threads_.emplace_back([this] {
        std::unique_lock<std::mutex> lock(mutex_);
        Serve(lock);
    });
}

void ThreadPool::Join() {
    std::unique_lock<std::mutex> lock(mutex_);
    ++joined_;
    Serve(lock);
    --joined_;
    joined_cv_.notify_all();
}

void ThreadPool::Serve(std::unique_lock<std::mutex>& lock) {
    while (!stopping_) {
        if (queue_.empty()) {
            ++idle_;
            work_cv_.wait(lock, [this] { return stopping_ || !queue_.empty(); });
            --idle_;
            continue;
        }
        std::function<void()> work = std::move(queue_.front());
        queue_.pop_front();
        lock.unlock();
        work();
        work = nullptr;
        lock.lock();
    }
}

void ThreadPool::Shutdown() {
    std::vector<std::thread> threads;
    std::deque<std::function<void()>> dropped;
    {
        std::unique_lock<std::mutex> lock(mutex_);
        stopping_ = true;
        work_cv_.notify_all();
        threads.swap(threads_);
        dropped.swap(queue_);
    }
    for (std::thread& thread : threads) thread.join();
    dropped.clear();
    std::unique_lock<std::mutex> lock(mutex_);
    joined_cv_.wait(lock, [this] { return joined_ == 0; });
    queue_.clear();
    started_ = false;
    stopping_ = false;
}

}  // namespace vyr_binder
