#include "forwarding_callback.h"

namespace vyrctl {

ndk::ScopedAStatus ForwardingCallback::OnEvent(const aidl::android::vyr::Event& event) {
    sink_(event);
    return ndk::ScopedAStatus::ok();
}

}  // namespace vyrctl
