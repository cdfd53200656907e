#pragma once

#include <android/binder_auto_utils.h>

#include <map>
#include <mutex>
#include <string>

#include "thread_pool.h"

namespace vyr_binder {

// Everything the runtime keeps per process. Made on first use and never destroyed, so runtime
// threads still running at exit never see it torn down; VyrBinder_shutdown empties it instead.
class ProcessState {
  public:
    static ProcessState& Get();

    ThreadPool& pool() { return pool_; }

    // Services this process published, by name.
    void AddLocalService(const std::string& name, const ndk::SpAIBinder& binder);
    ndk::SpAIBinder FindLocalService(const std::string& name);

    void Shutdown();

  private:
    ProcessState() = default;

    ThreadPool pool_;
    std::mutex services_mutex_;
    std::map<std::string, ndk::SpAIBinder> services_;
};

}  // namespace vyr_binder
