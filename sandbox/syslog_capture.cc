// Capture of syslog on the sandbox's /dev/log.
//
// glibc's syslog() connects a datagram socket to /dev/log and sends one
// datagram per line.  A thread drains the socket into memory as soon as
// anything arrives, so that a process that floods the log never waits for a
// test to read it.  Every receive happens under one mutex, by the thread or
// by TakeLogs() itself, so TakeLogs() sees each datagram that a sender
// finished sending before the call, and sees them in order.
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"

namespace xavo::test {
namespace detail {
namespace {

constexpr char kLogSocket[] = "/dev/log";
// Enough queue for a burst while the drain thread is not scheduled.
constexpr int kReceiveBuffer = 8 << 20;

std::mutex g_mutex;
int g_socket = -1;
std::vector<LogLine> g_lines;
char g_datagram[65536];

// Moves what is queued on the socket into g_lines; g_mutex is held.
void DrainLocked() {
    if (g_socket < 0) return;
    for (;;) {
        const ssize_t n = recv(g_socket, g_datagram, sizeof g_datagram, MSG_DONTWAIT);
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) return;
        g_lines.push_back(ParseSyslogDatagram(std::string_view(g_datagram, static_cast<std::size_t>(n))));
    }
}

void DrainForever() {
    for (;;) {
        pollfd p{g_socket, POLLIN, 0};
        if (poll(&p, 1, -1) > 0) {
            std::lock_guard<std::mutex> lock(g_mutex);
            DrainLocked();
        }
    }
}

bool IsTimestamp(std::string_view t) {
    // "Mmm dd hh:mm:ss", the day padded with a space.
    constexpr std::string_view kShape = "Aaa #9 99:99:99";
    if (t.size() < kShape.size()) return false;
    for (std::size_t i = 0; i < kShape.size(); ++i) {
        const auto c = static_cast<unsigned char>(t[i]);
        const char want = kShape[i];
        const bool ok = want == 'A'   ? std::isupper(c) != 0
                        : want == 'a' ? std::islower(c) != 0
                        : want == '9' ? std::isdigit(c) != 0
                        : want == '#' ? (c == ' ' || std::isdigit(c) != 0)
                                      : c == static_cast<unsigned char>(want);
        if (!ok) return false;
    }
    return true;
}

}  // namespace

LogLine ParseSyslogDatagram(std::string_view d) {
    LogLine line{-1, std::string(d)};
    if (d.size() < 3 || d[0] != '<') return line;
    const auto close = d.find('>');
    if (close == std::string_view::npos || close == 1 || close > 4) return line;
    int pri = 0;
    for (std::size_t i = 1; i < close; ++i) {
        if (std::isdigit(static_cast<unsigned char>(d[i])) == 0) return line;
        pri = pri * 10 + (d[i] - '0');
    }
    line.priority = pri & 7;
    std::string_view rest = d.substr(close + 1);
    if (IsTimestamp(rest)) rest.remove_prefix(std::min<std::size_t>(rest.size(), 16));
    const auto colon = rest.find(": ");
    line.message = std::string(colon == std::string_view::npos ? rest : rest.substr(colon + 2));
    return line;
}

void StartLogCapture() {
    g_socket = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_un addr{};
    addr.sun_family = AF_UNIX;
    std::strncpy(addr.sun_path, kLogSocket, sizeof addr.sun_path - 1);
    unlink(kLogSocket);
    if (g_socket < 0 || bind(g_socket, reinterpret_cast<sockaddr *>(&addr), sizeof addr) != 0 ||
        chmod(kLogSocket, 0666) != 0) {
        std::fprintf(stderr, "xavo test sandbox: cannot capture syslog on %s: %s\n", kLogSocket,
                     std::strerror(errno));
        std::_Exit(70);
    }
    // Larger than the default where the kernel allows it (root may force).
    setsockopt(g_socket, SOL_SOCKET, SO_RCVBUFFORCE, &kReceiveBuffer, sizeof kReceiveBuffer);
    std::thread(DrainForever).detach();
}

void ClearLogs() {
    std::lock_guard<std::mutex> lock(g_mutex);
    DrainLocked();
    g_lines.clear();
}

}  // namespace detail

std::vector<LogLine> TakeLogs() {
    std::lock_guard<std::mutex> lock(detail::g_mutex);
    detail::DrainLocked();
    std::vector<LogLine> out;
    out.swap(detail::g_lines);
    return out;
}

}  // namespace xavo::test
