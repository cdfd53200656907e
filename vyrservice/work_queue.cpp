#include "work_queue.h"

namespace android {
namespace vyr {
namespace binder {

void WorkQueue::PushAndSignal(const WorkItem& item) {
    std::lock_guard<std::mutex> lock(mutex);
    items.push_back(item);
    if (items.size() > highest_depth) highest_depth = items.size();
    cv.notify_all();
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
