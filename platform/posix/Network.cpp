#include "platform/Network.h"

#include <netdb.h>
#include <netinet/in.h>
#include <spawn.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstring>
#include <memory>

#include "platform/FileSystem.h"
#include "platform/posix/Descriptor.h"

extern char** environ;

namespace platform {
namespace {

struct FreeAddresses {
    void operator()(addrinfo* list) const { ::freeaddrinfo(list); }
};
using Addresses = std::unique_ptr<addrinfo, FreeAddresses>;

Addresses Resolve(const std::string& host, std::uint16_t port, std::string& problem) {
    addrinfo hints = {};
    hints.ai_family = AF_UNSPEC;
    hints.ai_socktype = SOCK_STREAM;
    hints.ai_flags = AI_PASSIVE | AI_NUMERICSERV;
    addrinfo* found = nullptr;
    const int failure = ::getaddrinfo(host.c_str(), std::to_string(port).c_str(), &hints, &found);
    if (failure != 0) problem = ::gai_strerror(failure);
    return Addresses(found);
}

socklen_t SizeOf(const sockaddr& address) {
    return address.sa_family == AF_INET6 ? sizeof(sockaddr_in6) : sizeof(sockaddr_in);
}

std::uint16_t PortOf(const sockaddr_storage& address) {
    if (address.ss_family == AF_INET6) {
        sockaddr_in6 six;
        std::memcpy(&six, &address, sizeof six);
        return ntohs(six.sin6_port);
    }
    sockaddr_in four;
    std::memcpy(&four, &address, sizeof four);
    return ntohs(four.sin_port);
}

int ListenAt(const addrinfo& address, int waiting) {
    const int made =
        AwayFromStreams(::socket(address.ai_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (made < 0) return made;
    const int on = 1;
    static_cast<void>(::setsockopt(made, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on));
    if (::bind(made, address.ai_addr, address.ai_addrlen) == 0 && ::listen(made, waiting) == 0)
        return made;
    const int kept = errno;
    ::close(made);
    errno = kept;
    return -1;
}

}  // namespace

Listener Listen(const std::string& host, std::uint16_t port, int waiting) {
    Listener listener;
    const Addresses addresses = Resolve(host, port, listener.problem);
    for (const addrinfo* each = addresses.get(); each && listener.descriptor < 0;
         each = each->ai_next) {
        listener.descriptor = ListenAt(*each, waiting);
        if (listener.descriptor < 0) listener.problem = ErrorText(errno);
    }
    if (listener.descriptor < 0) return listener;
    sockaddr_storage bound = {};
    socklen_t size = sizeof bound;
    ::getsockname(listener.descriptor, reinterpret_cast<sockaddr*>(&bound), &size);
    listener.address = AddressText(&bound);
    listener.port = PortOf(bound);
    return listener;
}

std::string AddressText(const void* socketAddress) {
    char text[NI_MAXHOST] = {};
    const auto* const address = static_cast<const sockaddr*>(socketAddress);
    if (!address || (address->sa_family != AF_INET && address->sa_family != AF_INET6)) return {};
    if (::getnameinfo(address, SizeOf(*address), text, sizeof text, nullptr, 0, NI_NUMERICHOST) !=
        0)
        return {};
    return text;
}

bool IsLoopback(const std::string& address) {
    return address.compare(0, 4, "127.") == 0 || address == "::1" ||
           address.compare(0, 11, "::ffff:127.") == 0;
}

void EndConnection(int descriptor) { ::shutdown(descriptor, SHUT_RDWR); }

void CloseDescriptor(int descriptor) { ::close(descriptor); }

std::size_t RaiseOpenFiles() {
    rlimit limit = {};
    if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) return 1024;
    rlimit raised = limit;
    raised.rlim_cur = limit.rlim_max;
    if (::setrlimit(RLIMIT_NOFILE, &raised) == 0) limit = raised;
    constexpr std::size_t kMost = std::size_t{1} << 20;
    return limit.rlim_cur > kMost ? kMost : static_cast<std::size_t>(limit.rlim_cur);
}

bool OpenInBrowser(const std::string& url) {
    std::string opener = "xdg-open", page = url;
    char* const words[] = {opener.data(), page.data(), nullptr};
    posix_spawn_file_actions_t actions;
    ::posix_spawn_file_actions_init(&actions);
    // What it says is no business of whoever reads ours.
    ::posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
    ::posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
    pid_t started = 0;
    const int failure = ::posix_spawnp(&started, opener.c_str(), &actions, nullptr, words, environ);
    ::posix_spawn_file_actions_destroy(&actions);
    return failure == 0;
}

}  // namespace platform
