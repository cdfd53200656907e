// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "options.h"

#include <cctype>
#include <cerrno>
#include <climits>
#include <cmath>
#include <cstdlib>

namespace vyrctl {

std::optional<int32_t> ParseInt32(const std::string& text) {
    if (text.empty() || isspace(static_cast<unsigned char>(text[0]))) return std::nullopt;
    errno = 0;
    char* end = nullptr;
    long long value = strtoll(text.c_str(), &end, 0);
    if (errno != 0 || end == text.c_str() || *end != '\0') return std::nullopt;
    if (value < INT32_MIN || value > INT32_MAX) return std::nullopt;
    return static_cast<int32_t>(value);
}

std::optional<double> ParseSeconds(const std::string& text) {
    if (text.empty() || isspace(static_cast<unsigned char>(text[0]))) return std::nullopt;
    errno = 0;
    char* end = nullptr;
    double value = strtod(text.c_str(), &end);
    if (errno != 0 || end == text.c_str() || *end != '\0') return std::nullopt;
    if (!std::isfinite(value) || value < 0) return std::nullopt;
    return value;
}

std::optional<int32_t> ParseMode(const std::string& text) {
    if (text == "als" || text == "light") return kModeAls;
    if (text == "range") return kModeRange;
    return ParseInt32(text);
}

const char* ModeName(int32_t mode) {
    switch (mode) {
        case kModeAls:
            return "als";
        case kModeRange:
            return "range";
        default:
            return "unknown";
    }
}

namespace {

// Takes the value of option `name` at args[*i + 1]; false when it is missing.
bool TakeValue(const std::vector<std::string>& args, size_t* i, const std::string& name,
               std::string* value, std::string* error) {
    if (*i + 1 >= args.size()) {
        *error = name + " needs a value";
        return false;
    }
    *value = args[++*i];
    return true;
}

bool TakeSeconds(const std::vector<std::string>& args, size_t* i, const std::string& name,
                 double* out, std::string* error) {
    std::string text;
    if (!TakeValue(args, i, name, &text, error)) return false;
    auto value = ParseSeconds(text);
    if (!value) {
        *error = name + ": '" + text + "' is not a number of seconds";
        return false;
    }
    *out = *value;
    return true;
}

bool TakePositiveInt(const std::vector<std::string>& args, size_t* i, const std::string& name,
                     int32_t* out, std::string* error) {
    std::string text;
    if (!TakeValue(args, i, name, &text, error)) return false;
    auto value = ParseInt32(text);
    if (!value || *value < 1) {
        *error = name + ": '" + text + "' is not a positive whole number";
        return false;
    }
    *out = *value;
    return true;
}

// The sensor that `command` names in its first argument: als (or light) or range.
bool TakeSensor(const std::vector<std::string>& args, const std::string& command, int32_t* mode,
                std::string* error) {
    if (args.empty()) {
        *error = command + " needs a sensor: als or range";
        return false;
    }
    if (args[0] == "als" || args[0] == "light") {
        *mode = kModeAls;
    } else if (args[0] == "range") {
        *mode = kModeRange;
    } else {
        *error = "unknown sensor '" + args[0] + "' (use als or range)";
        return false;
    }
    return true;
}

}  // namespace

bool ParseGlobalOptions(const std::vector<std::string>& argv, GlobalOptions* options,
                        std::string* error) {
    for (size_t i = 0; i < argv.size(); ++i) {
        const std::string& arg = argv[i];
        if (arg == "--timeout") {
            if (!TakeSeconds(argv, &i, arg, &options->timeout_s, error)) return false;
        } else if (options->command.empty()) {
            if (arg.size() > 1 && arg[0] == '-' && arg != "--help" && arg != "-h") {
                *error = "unknown option '" + arg + "'";
                return false;
            }
            options->command = arg;
        } else {
            options->args.push_back(arg);
        }
    }
    if (options->command.empty()) {
        *error = "no command given";
        return false;
    }
    return true;
}

bool ParseStreamOptions(const std::vector<std::string>& args, StreamOptions* options,
                        std::string* error) {
    if (!TakeSensor(args, "stream", &options->mode, error)) return false;
    bool chose_delivery = false;
    for (size_t i = 1; i < args.size(); ++i) {
        const std::string& arg = args[i];
        if (arg == "--period") {
            if (!TakePositiveInt(args, &i, arg, &options->period_ms, error)) return false;
        } else if (arg == "--callback" || arg == "--poll") {
            bool callback = arg == "--callback";
            if (chose_delivery && callback != options->use_callback) {
                *error = "--callback and --poll exclude each other";
                return false;
            }
            chose_delivery = true;
            options->use_callback = callback;
        } else if (arg == "--count") {
            int32_t count = 0;
            if (!TakePositiveInt(args, &i, arg, &count, error)) return false;
            options->count = count;
        } else if (arg == "--seconds") {
            double seconds = 0;
            if (!TakeSeconds(args, &i, arg, &seconds, error)) return false;
            options->seconds = seconds;
        } else if (arg == "--low-power") {
            options->low_power = true;
        } else if (arg == "--json") {
            options->json = true;
        } else if (arg == "--no-reconnect") {
            options->reconnect = false;
        } else if (arg == "--interface") {
            if (!TakePositiveInt(args, &i, arg, &options->interface_version, error)) return false;
            if (options->interface_version > 2) {
                *error = "--interface must be 1 or 2";
                return false;
            }
        } else if (arg == "--callback-delay") {
            if (!TakePositiveInt(args, &i, arg, &options->callback_delay_ms, error)) return false;
        } else {
            *error = "unknown stream option '" + arg + "'";
            return false;
        }
    }
    if (options->callback_delay_ms > 0 && !options->use_callback) {
        *error = "--callback-delay needs --callback";
        return false;
    }
    return true;
}

bool ParseRingOptions(const std::vector<std::string>& args, RingOptions* options,
                      std::string* error) {
    if (!TakeSensor(args, "ring", &options->mode, error)) return false;
    for (size_t i = 1; i < args.size(); ++i) {
        const std::string& arg = args[i];
        if (arg == "--period") {
            if (!TakePositiveInt(args, &i, arg, &options->period_ms, error)) return false;
        } else if (arg == "--seconds") {
            double seconds = 0;
            if (!TakeSeconds(args, &i, arg, &seconds, error)) return false;
            options->seconds = seconds;
        } else if (arg == "--json") {
            options->json = true;
        } else {
            *error = "unknown ring option '" + arg + "'";
            return false;
        }
    }
    return true;
}

bool ParseDemoViewOptions(const std::vector<std::string>& args, DemoViewOptions* options,
                          std::string* error) {
    for (size_t i = 0; i < args.size(); ++i) {
        const std::string& arg = args[i];
        if (arg == "--seconds") {
            if (!TakeSeconds(args, &i, arg, &options->seconds, error)) return false;
        } else if (arg == "--torch-at") {
            double at = 0;
            if (!TakeSeconds(args, &i, arg, &at, error)) return false;
            options->torch_at_s = at;
        } else if (arg == "--period") {
            if (!TakePositiveInt(args, &i, arg, &options->period_ms, error)) return false;
        } else {
            *error = "unknown demo-view option '" + arg + "'";
            return false;
        }
    }
    return true;
}

std::string UsageText() {
    return "usage: vyrctl [--timeout S] COMMAND [ARGS]\n"
           "\n"
           "Talks to the binder service \"vyrservice\" (waits for it up to --timeout seconds, "
           "default 15).\n"
           "\n"
           "commands:\n"
           "  shell                      read commands from stdin, one result line each "
           "('help' lists them)\n"
           "  stream als|range [--period MS] [--callback|--poll] [--count N | --seconds S]\n"
           "         [--low-power] [--json] [--no-reconnect] [--interface 1|2]\n"
           "         [--callback-delay MS]\n"
           "                             print each event of one sensor until done or Ctrl-C;\n"
           "                             carries on across restarts of the service unless\n"
           "                             --no-reconnect; a callback stream of interface 2 (the\n"
           "                             default) gets each sample as it is read, 1 on a timer\n"
           "  ring als|range [--period MS] [--seconds S] [--json]\n"
           "                             enable one sensor with EnableRing and print each sample\n"
           "                             read from the shared ring, with its age when read;\n"
           "                             --json prints the lines of stream --json; a gap\n"
           "                             (samples overwritten before they were read) is\n"
           "                             reported on stderr\n"
           "  configure V0 ... V10       send eleven control values to the range sensor\n"
           "  torch STATE                tell the light sensor the camera torch state\n"
           "  dump [--json]              the service's state: sensors, modes, clients, queues,\n"
           "                             display, APEX and recent events\n"
           "  demo-view [--seconds S] [--torch-at S] [--period MS]\n"
           "                             live view of both sensors side by side\n"
           "  wait                       wait until the service is registered, then exit 0\n"
           "  help                       this text\n";
}

}  // namespace vyrctl
