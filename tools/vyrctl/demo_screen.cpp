// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "demo_screen.h"

#include <algorithm>
#include <cstdio>

namespace vyrctl {
namespace {

constexpr size_t kGridZones = 4;
constexpr size_t kLeftWidth = 42;

std::string Printf(const char* format, double a) {
    char buffer[64];
    snprintf(buffer, sizeof(buffer), format, a);
    return buffer;
}

// "1234 mm [0]" for a zone, or "--" where the frame has fewer zones.
std::string ZoneCell(const RangeFrame& frame, size_t index) {
    if (index >= frame.zones.size()) return "--";
    char buffer[48];
    snprintf(buffer, sizeof(buffer), "%5.0f mm [%d]",
             static_cast<double>(frame.zones[index].distance_mm), frame.zones[index].target_status);
    return buffer;
}

std::string Centered(const std::string& text, size_t width) {
    if (text.size() >= width) return text;
    size_t left = (width - text.size()) / 2;
    return std::string(left, ' ') + text + std::string(width - text.size() - left, ' ');
}

std::vector<std::string> RangeLines(const DemoState& state) {
    std::vector<std::string> lines = {"RANGE (time-of-flight, 2x2 zones)",
                                      "distance to target, [zone status]"};
    if (!state.range_problem.empty()) {
        lines.push_back("  " + state.range_problem);
        return lines;
    }
    if (!state.range) {
        lines.push_back("  waiting for the first frame...");
        return lines;
    }
    const RangeFrame& frame = *state.range;
    const std::string rule = "  +----------------+----------------+";
    lines.push_back(rule);
    for (size_t row = 0; row < kGridZones / 2; ++row) {
        lines.push_back("  |" + Centered(ZoneCell(frame, row * 2), 16) + "|" +
                        Centered(ZoneCell(frame, row * 2 + 1), 16) + "|");
        lines.push_back(rule);
    }
    char buffer[96];
    snprintf(buffer, sizeof(buffer), "  frame %.0f, %d zones, %d events",
             static_cast<double>(frame.frame_number), frame.reported_zones, state.range_events);
    lines.push_back(buffer);
    return lines;
}

std::vector<std::string> AlsLines(const DemoState& state) {
    std::vector<std::string> lines = {"LIGHT (spectral ambient-light sensor)", ""};
    if (!state.als_problem.empty()) {
        lines.push_back("  " + state.als_problem);
        return lines;
    }
    if (!state.als) {
        lines.push_back("  waiting for the first reading...");
        return lines;
    }
    const AlsReading& als = *state.als;
    lines.push_back(Printf("  lux (value1)         %10.1f", static_cast<double>(als.lux)));
    lines.push_back(
        Printf("  colour temp (value0) %10.0f K", static_cast<double>(als.color_temperature)));
    lines.push_back("  channels, as delivered:");
    std::string channels = " ";
    for (float channel : als.channels) channels += Printf(" %.1f", static_cast<double>(channel));
    lines.push_back(" " + channels);
    lines.push_back("  " + std::to_string(state.als_events) + " events");
    return lines;
}

std::string TorchText(const DemoState& state) {
    if (state.torch_on) return "torch ON";
    if (state.torch_at_s) return Printf("torch off (turns on at %.1f s)", *state.torch_at_s);
    return "torch off";
}

}  // namespace

std::vector<std::string> DemoScreen::Panel(const DemoState& state) {
    char header[128];
    snprintf(header, sizeof(header), "vyrservice live view   %5.1f s of %g s   %s", state.elapsed_s,
             state.total_s, TorchText(state).c_str());
    std::vector<std::string> lines = {header, ""};
    std::vector<std::string> left = RangeLines(state);
    std::vector<std::string> right = AlsLines(state);
    size_t rows = std::max(left.size(), right.size());
    for (size_t i = 0; i < rows; ++i) {
        std::string l = i < left.size() ? left[i] : "";
        std::string r = i < right.size() ? right[i] : "";
        l.resize(std::max(l.size(), kLeftWidth), ' ');
        lines.push_back(l + r);
    }
    return lines;
}

std::string DemoScreen::PlainLine(const DemoState& state) {
    std::string line = Printf("[%5.1f s] range mm:", state.elapsed_s);
    if (!state.range_problem.empty()) {
        line += " " + state.range_problem;
    } else if (!state.range) {
        line += " (waiting)";
    } else {
        for (size_t i = 0; i < kGridZones; ++i) {
            line += (i == 2 ? " /" : "") + std::string(" ") + ZoneCell(*state.range, i);
        }
    }
    line += " | light:";
    if (!state.als_problem.empty()) {
        line += " " + state.als_problem;
    } else if (!state.als) {
        line += " (waiting)";
    } else {
        line += Printf(" lux=%.1f", static_cast<double>(state.als->lux));
        line +=
            Printf(" colour_temp=%.0f K ch=[", static_cast<double>(state.als->color_temperature));
        for (size_t i = 0; i < state.als->channels.size(); ++i) {
            line += Printf(i == 0 ? "%.1f" : " %.1f", static_cast<double>(state.als->channels[i]));
        }
        line += "]";
    }
    return line + " | " + TorchText(state);
}

}  // namespace vyrctl
