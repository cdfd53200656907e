#pragma once

#include <android-base/thread_annotations.h>
#include <android-base/unique_fd.h>
#include <sys/types.h>

#include <functional>
#include <map>
#include <mutex>
#include <thread>
#include <vector>

namespace android {
namespace vyr {
namespace binder {

// Tells when a client process ends, whether or not it ever passed a binder that could be linked
// to death: a poll-only client, or one killed before SetCallback, would otherwise keep its sensor
// running and its table slot for ever. Watches pidfds, which name one process and never a later
// one with the same pid, on one thread started by the first Watch.
class ClientProcessWatcher {
  public:
    using OnExit = std::function<void(pid_t)>;

    // `on_exit` runs on the watcher's thread, once per watched process that ends.
    explicit ClientProcessWatcher(OnExit on_exit);
    // Stops and joins the thread; no `on_exit` runs after this returns.
    ~ClientProcessWatcher();
    ClientProcessWatcher(const ClientProcessWatcher&) = delete;
    ClientProcessWatcher& operator=(const ClientProcessWatcher&) = delete;

    // Starts watching `pid` (again watching an already watched pid changes nothing). A process
    // that is already gone is reported as soon as the thread runs. False if it cannot be watched.
    bool Watch(pid_t pid) EXCLUDES(mutex_);
    void Unwatch(pid_t pid) EXCLUDES(mutex_);
    bool IsWatching(pid_t pid) EXCLUDES(mutex_);

  private:
    void Loop();
    void Wake();

    const OnExit on_exit_;
    std::mutex mutex_;
    std::map<pid_t, base::unique_fd> pidfds_ GUARDED_BY(mutex_);
    // Ended before they could be watched: a caller that died right after its call.
    std::vector<pid_t> gone_ GUARDED_BY(mutex_);
    // No longer watched, closed by the thread between two polls: closing one that a poll still
    // waits on would let its number name another file in that poll.
    std::vector<base::unique_fd> retired_ GUARDED_BY(mutex_);
    bool stopping_ GUARDED_BY(mutex_) = false;
    // Written to wake the thread when the set changes or it must stop.
    base::unique_fd wake_fd_;
    std::thread thread_;
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
