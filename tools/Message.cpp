#include "tools/Message.h"

#include <atomic>
#include <mutex>
#include <new>
#include <set>

#include "host/base/Error.h"
#include "platform/Terminal.h"
#include "tools/Visible.h"

namespace zmctools {
namespace {

std::atomic<bool> isQuiet{false};

}  // namespace

// Libraries tell some things on several lines. Names are visible already: what throws, and Warn,
// show them so.
void Say(const std::string& text) {
    std::string line = "zmcraster: ";
    for (const char c : text)
        if (c != '\n' && c != '\r')
            line += c;
        else if (line.back() != ' ')
            line += ' ';
    while (line.back() == ' ') line.pop_back();
    platform::WriteAtOnce(platform::StandardStream::Errors, Visible(line) + '\n');
}

Answer AnswerOfException() {
    try {
        throw;
    } catch (const UsageError& error) {
        return {ExitStatus::Usage, error.what()};
    } catch (const Interruption& error) {
        return {ExitStatus::Interrupted, error.what()};
    } catch (const std::bad_alloc&) {
        return {ExitStatus::Failed, "out of memory"};
    } catch (const zmchost::Error& error) {
        return {ExitStatus::Failed,
                Visible(error.File()) + ": cannot " + error.Operation() + ": " + error.Reason()};
    } catch (const std::exception& error) {
        return {ExitStatus::Failed, error.what()};
    }
}

// What several readers of one file find is said once.
void Warn(const std::string& file, const std::string& what) {
    WarnAgain(Visible(file) + ": warning: " + what);
}

void WarnAgain(const std::string& text) {
    static std::mutex mutex;
    static std::set<std::string> said;
    if (isQuiet) return;
    const std::lock_guard lock(mutex);
    if (said.insert(text).second) Say(text);
}

void WarnOfLoss() {
    if (!isQuiet)
        platform::WriteAtOnce(platform::StandardStream::Errors,
                              "zmcraster: warning: out of memory, and what it was about is lost\n");
}

void SetQuiet(bool quiet) { isQuiet = quiet; }

}  // namespace zmctools
