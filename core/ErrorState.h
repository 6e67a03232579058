// Errors of the object model: numbers stored in the object that failed.
//
// Nothing is thrown and no text is kept. Whoever fails builds an error value with its class's
// code, and stores its record with SetError; whoever cares reads it (Object::IsValid). A record,
// once stored, is never cleared.
#ifndef ZMC_CORE_ERRORSTATE_H
#define ZMC_CORE_ERRORSTATE_H

#include <cstdint>

namespace zelm {

struct ErrorRecord {
    std::uint32_t flags = 0;  // 0: nothing wrong; bit 2 (value 4): an error
    std::uint32_t code = 0;   // code of the error's class; 0 in a fresh object
};

// The one bit of ErrorRecord::flags that is tested.
inline constexpr std::uint32_t kErrorFlag = 4;

// What an object can be told of its health: the base of the errors below. Hosts derive classes of
// their own, with a code drawn by GloballyUniqueErrorCode (ObjectCodes.h).
class ObjectErrorState {
public:
    std::uint32_t code;  // of the class, drawn once in the process

    explicit ObjectErrorState(std::uint32_t errorCode) : code(errorCode) {}
    virtual ~ObjectErrorState() = default;
    // The record that SetError stores: here one without the flag of an error.
    virtual ErrorRecord GetState() const { return {0, code}; }
};

// One that makes the object it is stored in invalid.
class ObjectError : public ObjectErrorState {
public:
    using ObjectErrorState::ObjectErrorState;
    ErrorRecord GetState() const override { return {kErrorFlag, code}; }
};

// Raised by Array when element storage cannot be allocated.
class ObjectErrorOutOfMemory : public ObjectError {
public:
    static const std::uint32_t errorCode;
    ObjectErrorOutOfMemory() : ObjectError(errorCode) {}
};

// Raised by RasterReaderDispatch when it is built without a reader.
class RasterReaderErrorInvalid : public ObjectError {
public:
    static const std::uint32_t errorCode;
    RasterReaderErrorInvalid() : ObjectError(errorCode) {}
};

// What every class with a state of health derives from.
class ErrorState {
public:
    ErrorRecord error;  // the last one stored

    ErrorState() = default;
    // A copy starts healthy, and assignment leaves the target's state: records are not copied.
    ErrorState(const ErrorState&) : error() {}
    // NOLINTNEXTLINE(cert-oop54-cpp): there is nothing that assigning to itself could break.
    ErrorState& operator=(const ErrorState&) { return *this; }
    virtual ~ErrorState() = default;

    // Stores the record of `source`, in place of one that is there. Only whoever owns the object
    // for the moment may call it: nothing is synchronised.
    void SetError(const ObjectErrorState& source) { error = source.GetState(); }
};

}  // namespace zelm

#endif
