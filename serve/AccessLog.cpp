#include "serve/AccessLog.h"

#include "host/base/Error.h"
#include "platform/Terminal.h"
#include "serve/HttpDate.h"

namespace zmcserve {
namespace {

// Lines are gathered as long, so that a request costs no call of the system.
constexpr std::chrono::milliseconds kPause(100);

std::string Plain(std::string_view text) {
    constexpr char kDigits[] = "0123456789ABCDEF";
    std::string plain;
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        if (c > 0x20 && c < 0x7F && c != '"' && c != '\\')
            plain += c;
        else
            plain.append({'\\', 'x', kDigits[byte >> 4], kDigits[byte & 15]});
    }
    return plain;
}

// "Sun, 06 Nov 1994 08:49:37 GMT" as "06/Nov/1994:08:49:37 +0000"
std::string TimeOf(std::int64_t seconds) {
    std::string text = HttpDateText(seconds).substr(5, 20);
    text[2] = text[6] = '/';
    text[11] = ':';
    return text + " +0000";
}

}  // namespace

AccessLog::AccessLog(const std::string& file, Metrics& counts) : metrics(counts) {
    if (!file.empty()) {
        target.reset(std::fopen(file.c_str(), "ae"));
        if (!target) throw zmchost::Error(file, "write the access log", "it cannot be opened");
    }
    writer = std::thread([this] { Run(); });
}

AccessLog::~AccessLog() {
    {
        const std::lock_guard lock(mutex);
        ending = true;
    }
    changed.notify_one();
    writer.join();
}

std::string AccessLog::LineOf(const LoggedRequest& request, std::int64_t seconds) {
    std::string line = Plain(request.client);
    line.append(" - - [").append(TimeOf(seconds)).append("] \"");
    line.append(Plain(request.method)).append(" ").append(Plain(request.target));
    line.append(" ").append(Plain(request.protocol)).append("\" ");
    line.append(std::to_string(request.status)).append(" ").append(std::to_string(request.bytes));
    return line.append(" ").append(std::to_string(request.time.count())).append("\n");
}

void AccessLog::Add(const LoggedRequest& request) {
    const auto now = std::chrono::system_clock::now().time_since_epoch();
    const std::string line =
        LineOf(request, std::chrono::duration_cast<std::chrono::seconds>(now).count());
    const std::lock_guard lock(mutex);
    if (waiting.size() + line.size() > kMostBytes)
        ++metrics.lostLogLines;
    else
        waiting += line;
}

void AccessLog::Write(const std::string& text) {
    if (!target) return platform::WriteAtOnce(platform::StandardStream::Errors, text);
    static_cast<void>(std::fwrite(text.data(), 1, text.size(), target.get()));
    static_cast<void>(std::fflush(target.get()));
}

void AccessLog::Run() {
    std::unique_lock lock(mutex);
    for (;;) {
        changed.wait_for(lock, kPause, [this] { return ending; });
        const bool last = ending;
        std::string text;
        text.swap(waiting);
        lock.unlock();
        if (!text.empty()) Write(text);
        if (last) return;
        lock.lock();
    }
}

}  // namespace zmcserve
