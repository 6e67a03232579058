// What the command tells people apart from its results, and how it ends.
//
// Every message is one line on stderr: "zmcraster: FILE: what is wrong". A command that cannot go
// on throws; main turns what was thrown into a message and an exit status.
#ifndef ZMC_TOOLS_MESSAGE_H
#define ZMC_TOOLS_MESSAGE_H

#include <stdexcept>
#include <string>

#include "tools/Visible.h"

namespace zmctools {

enum class ExitStatus { Done = 0, Failed = 1, Usage = 2, Differences = 3, Interrupted = 130 };

// The operation failed; the text is what follows the file's name.
class Failure : public std::runtime_error {
public:
    Failure(const std::string& file, const std::string& what)
        : std::runtime_error(Visible(file) + ": " + what) {}
};

// The command line asks for something that does not exist.
class UsageError : public std::runtime_error {
public:
    // `option` is the option or argument as it was written.
    UsageError(const std::string& option, const std::string& what)
        : std::runtime_error(Visible(option) + ": " + what) {}
};

// Somebody asked for an end while the command worked on `file`.
class Interruption : public std::runtime_error {
public:
    explicit Interruption(const std::string& file)
        : std::runtime_error(Visible(file) + ": interrupted") {}
};

// Writes a message, on one line and with nothing that steers a terminal, whatever `text` holds.
void Say(const std::string& text);

// What the exception that is being handled is answered with: a message, which is not said yet, and
// a status. To be called from a handler.
struct Answer {
    ExitStatus status = ExitStatus::Failed;
    std::string text;
};
Answer AnswerOfException();

// Says of a file what does not keep a command from going on, each text once; silent after
// SetQuiet(true). Any thread may call.
void Warn(const std::string& file, const std::string& what);
// The same of a whole text that another process of this program has said.
void WarnAgain(const std::string& text);
// Tells that a warning was lost for want of memory; takes none itself.
void WarnOfLoss();
void SetQuiet(bool quiet);

}  // namespace zmctools

#endif
