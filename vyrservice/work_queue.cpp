#include "work_queue.h"

namespace android {
namespace vyr {
namespace binder {

void WorkQueue::PushAndSignal(const WorkItem& item) {
    std::lock_guard<std::mutex> lock(mutex);
    items.push_back(item);
    cv.notify_all();
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
