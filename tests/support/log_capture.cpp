// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "log_capture.h"

#include <condition_variable>
#include <cstdio>
#include <mutex>

namespace vyr_test {
namespace {

std::mutex g_mutex;
std::condition_variable g_changed;
std::vector<LogRecord> g_records;
bool g_active = false;

void CaptureLogger(const __android_logger_data* data, const char* message) {
    LogRecord record{data->tag ? data->tag : "", data->priority, message ? message : ""};
    fprintf(stderr, "[log %d %s] %s\n", record.priority, record.tag.c_str(), record.message.c_str());
    std::lock_guard<std::mutex> lock(g_mutex);
    if (!g_active) return;
    g_records.push_back(std::move(record));
    g_changed.notify_all();
}

size_t CountLocked(const std::string& tag, int priority, const std::string& message) {
    size_t count = 0;
    for (const auto& r : g_records) {
        if (r.tag == tag && r.priority == priority && r.message == message) ++count;
    }
    return count;
}

}  // namespace

LogCapture::LogCapture() {
    {
        std::lock_guard<std::mutex> lock(g_mutex);
        g_records.clear();
        g_active = true;
    }
    __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
    __android_log_set_logger(CaptureLogger);
}

LogCapture::~LogCapture() {
    std::lock_guard<std::mutex> lock(g_mutex);
    // The logger stays installed: threads that outlive a test may still log, and liblog offers
    // no safe way to swap loggers under them. Records simply stop being kept.
    g_active = false;
    g_records.clear();
}

std::vector<LogRecord> LogCapture::Records() const {
    std::lock_guard<std::mutex> lock(g_mutex);
    return g_records;
}

void LogCapture::Clear() {
    std::lock_guard<std::mutex> lock(g_mutex);
    g_records.clear();
}

size_t LogCapture::Count(const std::string& tag, int priority, const std::string& message) const {
    std::lock_guard<std::mutex> lock(g_mutex);
    return CountLocked(tag, priority, message);
}

bool LogCapture::Contains(const std::string& tag, int priority, const std::string& message) const {
    return Count(tag, priority, message) > 0;
}

bool LogCapture::WaitFor(const std::string& tag, int priority, const std::string& message,
                         std::chrono::milliseconds timeout, size_t count) const {
    std::unique_lock<std::mutex> lock(g_mutex);
    return g_changed.wait_for(lock, timeout,
                              [&] { return CountLocked(tag, priority, message) >= count; });
}

bool LogCapture::WaitUntil(const std::function<bool(const std::vector<LogRecord>&)>& predicate,
                           std::chrono::milliseconds timeout) const {
    std::unique_lock<std::mutex> lock(g_mutex);
    return g_changed.wait_for(lock, timeout, [&] { return predicate(g_records); });
}

}  // namespace vyr_test
