// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sensors_sim/scene_model.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace sensors_sim {
namespace {

constexpr double kTwoPi = 6.283185307179586;
// Colour temperature of a white LED torch.
constexpr double kTorchCctK = 5600.0;
// Readings of the light sensor's slow drift: one full swing every this many samples.
constexpr double kLightDriftSamples = 400.0;
// Counts per lux and millisecond of integration, before the channel's own response.
constexpr double kCountsPerLuxMs = 0.05;
// Target status codes of the ranging part.
constexpr uint8_t kStatusValid = 5;
constexpr uint8_t kStatusWeakSignal = 6;

enum Stream : uint64_t {
    kSceneSetup = 1,
    kZoneDistance,
    kZoneSignal,
    kZoneAmbient,
    kZoneSpads,
    kLight,
    kLightChannel,
};

uint64_t SplitMix64(uint64_t x) {
    x += 0x9e3779b97f4a7c15ull;
    x = (x ^ (x >> 30)) * 0xbf58476d1ce4e5b9ull;
    x = (x ^ (x >> 27)) * 0x94d049bb133111ebull;
    return x ^ (x >> 31);
}

template <typename T>
T Saturate(double value) {
    const double low = static_cast<double>(std::numeric_limits<T>::min());
    const double high = static_cast<double>(std::numeric_limits<T>::max());
    return static_cast<T>(std::lround(std::clamp(value, low, high)));
}

}  // namespace

SceneModel::SceneModel(uint64_t seed) : seed_(seed) {
    // Uniform draws in [0, 1) fix the scene for this seed.
    auto draw = [this](uint64_t i) { return (Noise(kSceneSetup, i) + 1.0) / 2.0; };
    base_distance_mm_ = 600.0 + 800.0 * draw(0);
    swing_mm_ = 150.0 + 350.0 * draw(1);
    swing_period_ms_ = 6000.0 + 8000.0 * draw(2);
    swing_phase_ = kTwoPi * draw(3);
    // A slightly tilted target: each zone sees it a little nearer or further.
    for (int zone = 0; zone < kMaxRangingZones; ++zone) {
        zone_offset_mm_[zone] = 60.0 * (draw(4 + zone) - 0.5);
    }
    reflectance_ = 0.2 + 0.6 * draw(10);
    ambient_rate_ = 5.0 + 40.0 * draw(11);
    room_lux_ = 80.0 + 520.0 * draw(12);
    room_cct_k_ = 2700.0 + 3800.0 * draw(13);
    light_phase_ = kTwoPi * draw(14);
    torch_lux_ = 800.0 + 400.0 * draw(15);
}

double SceneModel::Noise(uint64_t stream, uint64_t index) const {
    const uint64_t bits = SplitMix64(seed_ ^ SplitMix64(stream * 0x100000001b3ull ^ index));
    return static_cast<double>(bits >> 11) * (2.0 / 9007199254740992.0) - 1.0;
}

double SceneModel::TargetDistanceMm(double time_ms) const {
    return base_distance_mm_ +
           swing_mm_ * std::sin(kTwoPi * time_ms / swing_period_ms_ + swing_phase_);
}

int16_t SceneModel::TemperatureC(double time_ms) const {
    // Warms up over the first minute of ranging.
    return Saturate<int16_t>(27.0 + 8.0 * (1.0 - std::exp(-time_ms / 60000.0)));
}

void SceneModel::FillZones(uint32_t frame_number, double time_ms, int zone_count,
                           MultiRangingData* data) const {
    const int zones = std::clamp(zone_count, 0, kMaxRangingZones);
    const double target_mm = TargetDistanceMm(time_ms);
    for (int zone = 0; zone < kMaxRangingZones; ++zone) {
        RangingZone& z = data->zones[zone];
        z = RangingZone{};
        if (zone >= zones) continue;
        const uint64_t index = static_cast<uint64_t>(frame_number) * kMaxRangingZones + zone;
        const double true_mm = target_mm + zone_offset_mm_[zone];
        const double metres = true_mm / 1000.0;
        // Returned photons fall with the square of distance; noise grows as they do.
        const double signal =
            1200.0 * reflectance_ / (metres * metres) * (1.0 + 0.05 * Noise(kZoneSignal, index));
        const double ambient = ambient_rate_ * (1.0 + 0.2 * Noise(kZoneAmbient, index));
        const double sigma = 1.5 + 3000.0 / std::max(signal, 1.0) + 0.02 * ambient;
        const double measured = true_mm + sigma * Noise(kZoneDistance, index);

        z.target_status = signal > 40.0 ? kStatusValid : kStatusWeakSignal;
        z.distance_mm = Saturate<int16_t>(measured);
        z.sigma_mm = Saturate<int16_t>(sigma);
        z.signal_rate = Saturate<uint32_t>(signal);
        z.ambient_rate = Saturate<uint32_t>(ambient);
        z.spad_count = Saturate<uint32_t>(1200.0 + 100.0 * Noise(kZoneSpads, index));
        z.min_distance_mm = Saturate<int16_t>(measured - 2.0 * sigma);
        z.target_count = 1;
        z.confidence = Saturate<uint8_t>(100.0 - 4.0 * sigma);
        z.reflectance = Saturate<uint8_t>(100.0 * reflectance_);
        z.flags = 0;
    }
}

ALSResult SceneModel::LightSample(uint64_t index, bool torch_lit, unsigned integration_ms) const {
    const double drift = 1.0 + 0.25 * std::sin(kTwoPi * index / kLightDriftSamples + light_phase_);
    const double room = room_lux_ * drift * (1.0 + 0.01 * Noise(kLight, index));
    const double torch = torch_lit ? torch_lux_ : 0.0;
    const double lux = room + torch;
    // The mix's colour temperature, weighted by each source's share of the light.
    const double cct = (room * room_cct_k_ + torch * kTorchCctK) / lux;

    // Channel responses: blue rises and red falls with colour temperature; warm sources (and
    // daylight) carry near infrared, the LED torch hardly any.
    const double x = std::clamp((cct - 2500.0) / 5000.0, 0.0, 1.0);
    const double blue = 0.2 + 0.6 * x;
    const double green = 0.5;
    const double red = 0.8 - 0.5 * x;
    const double clear = blue + green + red;
    const double infrared = (room * (0.35 - 0.25 * x) + torch * 0.03) / lux;
    const double response[5] = {blue, green, red, clear, infrared};

    ALSResult result{};
    const double scale = lux * kCountsPerLuxMs * integration_ms;
    for (int channel = 0; channel < 5; ++channel) {
        const double noise = 1.0 + 0.005 * Noise(kLightChannel, index * 5 + channel);
        result.channels[channel] = static_cast<float>(scale * response[channel] * noise);
    }
    result.lux = static_cast<float>(lux);
    result.color_temperature = static_cast<float>(cct);
    return result;
}

}  // namespace sensors_sim
