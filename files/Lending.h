// Lending: a source under a name that the module opens like the name of any file.
//
// Code of the process lends a source and gets a name for it, drawn from the randomness of the
// system. Whoever opens that name (OpenSource.h) gets the source; nobody else can reach it, because
// the name cannot be guessed. It is good in this process alone, and only as long as the LentName
// lives: it holds no address, and one that is not known, or not any more, opens nothing, not even a
// file of that name.
//
//     auto source = std::make_shared<HttpSource>(url);    // a ByteSource of the host's own
//     const LentName name = Lend(source);
//     if (!name) ...                                      // no memory, or no randomness
//     connection->Open(name.Text(), ...);                 // the module reads from `source`
//     // with `name` gone, what is open goes on, and nothing opens it again
//
// A lent name is a capability, like the address in a memory raster's string: it is made where it is
// used, and never taken from a file, a command line, a URL, an environment variable or a dataset
// name. Programs refuse there whatever LooksLent.
//
// The code of a source has to stay loaded as long as anybody holds the source. A module that lends
// and can be unloaded withdraws, and waits until it is the only holder, before it goes.
//
// There is one registry in a process, that of this library, whoever links it or loads it. All
// functions may be called from any thread, at load time and at the end of the process too, and from
// within a source. Nothing throws.
//
// A process that forks hands its copy all that it has, the registry included: names that were good
// at that moment are good in the copy as well, as are the sources behind them, and what either does
// to its registry from then on does not concern the other. Names that one of them draws later mean
// nothing to the other. A program that is started knows none.
#ifndef ZMC_FILES_LENDING_H
#define ZMC_FILES_LENDING_H

#include <cstddef>
#include <memory>
#include <string_view>

#include "core/String.h"
#include "files/ByteSource.h"
#include "files/FilesApi.h"

namespace zelm::files {

// What all lent names begin with, and no file's name should.
inline constexpr std::string_view kLentPrefix = "zmc-lent:";

// A source lent for as long as this object lives. Moves, and does not copy. One thread at a time.
class ZMC_FILES_API LentName {
public:
    // Nothing lent.
    LentName() noexcept = default;
    LentName(LentName&& other) noexcept;
    // Withdraws what it held before.
    LentName& operator=(LentName&& other) noexcept;
    ~LentName();

    explicit operator bool() const noexcept { return *text != 0; }
    // The name, zero-terminated, in both forms of the object model's text; empty if nothing is
    // lent. Good until this object changes.
    const WideChar* Text() const noexcept { return text; }
    const char* Utf8() const noexcept { return utf8; }

    // Ends the loan: the name opens nothing from now on. Whoever has opened it keeps the source,
    // which goes with its last holder; if that is the registry, it goes here, on this thread.
    void Withdraw() noexcept;

private:
    friend ZMC_FILES_API LentName Lend(std::shared_ptr<ByteSource> source) noexcept;

    static constexpr std::size_t kRandomBytes = 16;
    static constexpr std::size_t kLength = kLentPrefix.size() + 2 * kRandomBytes;

    bool Draw() noexcept;
    void Take(LentName& other) noexcept;

    WideChar text[kLength + 1] = {};
    char utf8[kLength + 1] = {};
};

// Lends `source` under a new name of 128 random bits. Nothing is lent, and the result is false, for
// null, without memory, and where the system has no randomness. A source may be lent several times.
ZMC_FILES_API LentName Lend(std::shared_ptr<ByteSource> source) noexcept;

// The source of that name; null for a name that is unknown or withdrawn. It stays whole as long as
// the caller holds it, also when it is withdrawn meanwhile.
ZMC_FILES_API std::shared_ptr<ByteSource> FindLent(const String& name) noexcept;

// Whether a text has the form of a lent name, good or not: it begins with kLentPrefix. A name that
// merely holds that somewhere is the name of a file.
ZMC_FILES_API bool LooksLent(const String& name) noexcept;
ZMC_FILES_API bool LooksLent(std::string_view utf8Name) noexcept;
inline bool LooksLent(const char* utf8Name) noexcept {
    return utf8Name && LooksLent(std::string_view(utf8Name));
}

}  // namespace zelm::files

#endif
