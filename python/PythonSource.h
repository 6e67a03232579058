// PythonSource: a file object of Python's as a byte source, for reading.
//
// Any thread may call, with or without Python's lock as long as no other thread that holds it waits
// for this one: transfers go on one after the other, behind a lock of their own, which is taken
// before Python's. What the object raises fails the transfer, and is kept for whoever can raise it.
// What it answers is looked at: more bytes than were asked for, or something else than bytes, is a
// failure too, and where it ends too early whoever reads finds out by its size.
#ifndef ZMC_PYTHON_PYTHONSOURCE_H
#define ZMC_PYTHON_PYTHONSOURCE_H

#include <pybind11/pybind11.h>

#include <atomic>
#include <memory>
#include <mutex>
#include <thread>

#include "files/ByteSource.h"
#include "python/PythonFailure.h"

namespace zmcpython {

class PythonSource final : public zelm::files::ByteSource {
public:
    // An object with `seek` and `read`, as binary files have them. Python's lock is held.
    explicit PythonSource(pybind11::object fileObject);
    ~PythonSource() override;  // NOLINT(bugprone-exception-escape): not while there is a Python.

    // With Python's lock held.
    PythonFailure& Failure() { return failure; }

protected:
    zelm::files::Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override;
    int DoTellSize(std::uint64_t& size) const override;
    zelm::files::Identity DoIdentify() const override;

private:
    class Turn;
    template <class Work>
    int Ask(Work&& work) const;
    std::uint64_t Seek(std::uint64_t offset, int from) const;

    const std::uint64_t number;
    pybind11::object file;
    mutable PythonFailure failure;
    mutable std::mutex mutex;
    // Whose turn it is: an object that reads the raster which is made of it would wait for itself.
    mutable std::atomic<std::thread::id> holder;
};

}  // namespace zmcpython

#endif
