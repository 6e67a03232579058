// AccessLog: a line for each request, written by a thread of its own.
//
//     127.0.0.1 - - [22/Nov/2026:16:01:02 +0000] "GET /tiles/a.pyr/0/0/0.jpg HTTP/1.1" 200 5120
//     1870
//
// which is the common log format with the time in microseconds behind it. The status is 0 where the
// client went before there was an answer. Of what the HTTP library refuses by itself, such as heads
// that are too long, method and protocol are "-". What a client sent stands with `\xHH` in place of
// quotes, backslashes and all that is no printable ASCII character. Lines that the reader of the
// log does not take in time are dropped and counted, so that nobody waits for it. Any thread may
// call.
#ifndef ZMC_SERVE_ACCESSLOG_H
#define ZMC_SERVE_ACCESSLOG_H

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>

#include "serve/Metrics.h"

namespace zmcserve {

struct LoggedRequest {
    std::string_view client;
    std::string_view method;
    std::string_view target;
    std::string_view protocol;
    int status = 0;
    std::uint64_t bytes = 0;
    std::chrono::microseconds time{0};
};

class AccessLog {
public:
    // Appends to the file; an empty name means stderr. Throws zmchost::Error.
    AccessLog(const std::string& file, Metrics& counts);
    // Writes what is left.
    ~AccessLog();
    AccessLog(const AccessLog&) = delete;
    AccessLog& operator=(const AccessLog&) = delete;

    void Add(const LoggedRequest& request);
    static std::string LineOf(const LoggedRequest& request, std::int64_t secondsSince1970);

private:
    static constexpr std::size_t kMostBytes = std::size_t{1} << 20;  // that wait to be written

    struct CloseFile {
        void operator()(std::FILE* file) const { static_cast<void>(std::fclose(file)); }
    };

    void Run();
    void Write(const std::string& text);

    Metrics& metrics;
    std::unique_ptr<std::FILE, CloseFile> target;  // null: stderr
    std::mutex mutex;                              // guards what follows
    std::condition_variable changed;
    std::string waiting;
    bool ending = false;
    std::thread writer;
};

}  // namespace zmcserve

#endif
