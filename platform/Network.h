// The little of networks that a server asks the system for by itself.
//
// Descriptors are not inherited by programs that are started, and none has the number of a standard
// stream. What answers with a text may throw std::bad_alloc; nothing else throws.
#ifndef ZMC_PLATFORM_NETWORK_H
#define ZMC_PLATFORM_NETWORK_H

#include <cstddef>
#include <cstdint>
#include <string>

namespace platform {

struct Listener {
    int descriptor = -1;  // below 0: it could not be made
    std::string address;  // in numbers: "127.0.0.1" or "::1"
    std::uint16_t port = 0;
    std::string problem;  // why it could not be made
};

// Listens for connections at an address or name of this machine; port 0 lets the system choose.
// `waiting` connections may wait to be accepted.
Listener Listen(const std::string& host, std::uint16_t port, int waiting);

// The address of a peer, in numbers, out of what a library has of it (a struct sockaddr); empty if
// it cannot be told.
std::string AddressText(const void* socketAddress);
// Whether only this machine can reach it.
bool IsLoopback(const std::string& address);

// Ends both directions of a connection; whoever has it open finds out.
void EndConnection(int descriptor);
void CloseDescriptor(int descriptor);

// Lets this process have as many open files as it may; answers how many these are.
std::size_t RaiseOpenFiles();

// Has the user's browser show a page. False where none can be started; whether it does shows there
// alone.
bool OpenInBrowser(const std::string& url);

}  // namespace platform

#endif
