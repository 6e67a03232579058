// Error: what every failure of this library is thrown as.
//
// The text names the file, what was being done to it and why it failed, in one line:
// "scene.zmc: cannot read lines 0 to 255: the source ended". It is meant for people; a program that
// wants to tell failures apart has the three parts. What a failed operation leaves behind is told
// where the operation is. Memory that runs out is thrown as std::bad_alloc, not as an Error.
#ifndef ZMC_HOST_BASE_ERROR_H
#define ZMC_HOST_BASE_ERROR_H

#include <stdexcept>
#include <string>

namespace zmchost {

class Error : public std::runtime_error {
public:
    // `operation` is a verb with its object, as it stands after "cannot".
    Error(std::string fileName, std::string operationText, std::string reasonText)
        : std::runtime_error(fileName + ": cannot " + operationText + ": " + reasonText),
          file(std::move(fileName)),
          operation(std::move(operationText)),
          reason(std::move(reasonText)) {}

    // The name as the caller gave it, as a rule; a file beside it where that one failed.
    const std::string& File() const { return file; }
    const std::string& Operation() const { return operation; }
    // The system's own words where it was the system that refused.
    const std::string& Reason() const { return reason; }

private:
    std::string file;
    std::string operation;
    std::string reason;
};

// Thrown when the caller asked for an end: nothing is wrong, and nothing was left behind.
class Cancelled : public Error {
public:
    Cancelled(std::string fileName, std::string operationText)
        : Error(std::move(fileName), std::move(operationText), "cancelled") {}
};

}  // namespace zmchost

#endif
