#pragma once

#include <cstdint>

namespace android {
namespace vyr {
namespace binder {

// Sensor modes as clients name them.
constexpr int32_t kAlsMode = 1;
constexpr int32_t kRangeMode = 3;
// Sensor types: the index of a sensor's worker, queue and sensor lock.
constexpr unsigned int kAlsSensorType = 0;
constexpr unsigned int kRangeSensorType = 1;

}  // namespace binder
}  // namespace vyr
}  // namespace android
