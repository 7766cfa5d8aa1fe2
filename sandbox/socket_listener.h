// A printer on loopback for the printing tests: accepts TCP connections on
// 127.0.0.1 (the port the kernel picks, or a given one) and keeps every byte sent to it,
// like a JetDirect "socket" printer.  CUPS's socket backend prints to it
// with the device URI "socket://127.0.0.1:<Port()>".
//
//     SocketListener printer;              // listening from here on
//     ... print to socket://127.0.0.1:printer.Port() ...
//     EXPECT_EQ(printer.WaitForBytes(want.size(), 10000), want);
//
// One thread serves connections one after another; the destructor stops
// it and closes everything.  Every wait is bounded.
#pragma once

#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <mutex>
#include <string>
#include <thread>

namespace xavo::test {

class SocketListener {
public:
    // Port 0: the kernel picks one.  A fixed port (9100, the JetDirect
    // port) is free in the sandbox's own network.
    explicit SocketListener(std::uint16_t port = 0) {
        fd_ = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
        const int reuse = 1;
        if (fd_ >= 0) setsockopt(fd_, SOL_SOCKET, SO_REUSEADDR, &reuse, sizeof reuse);
        sockaddr_in addr{};
        addr.sin_family = AF_INET;
        addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        addr.sin_port = htons(port);
        socklen_t len = sizeof addr;
        if (fd_ < 0 || bind(fd_, reinterpret_cast<sockaddr *>(&addr), sizeof addr) != 0 || listen(fd_, 4) != 0 ||
            getsockname(fd_, reinterpret_cast<sockaddr *>(&addr), &len) != 0) {
            return;
        }
        port_ = ntohs(addr.sin_port);
        thread_ = std::thread([this] { Serve(); });
    }
    SocketListener(const SocketListener &) = delete;
    SocketListener &operator=(const SocketListener &) = delete;
    ~SocketListener() {
        stop_ = true;
        if (thread_.joinable()) thread_.join();
        if (fd_ >= 0) close(fd_);
    }

    // 0 when the listener could not be set up.
    std::uint16_t Port() const { return port_; }
    // Connections accepted so far.
    int Connections() const { return connections_; }
    // Everything received so far.
    std::string Received() const {
        std::lock_guard<std::mutex> guard(mutex_);
        return received_;
    }
    // Waits until at least cbWanted bytes arrived and the sender closed its
    // connection, or iTimeoutMs passed; what arrived.
    std::string WaitForBytes(size_t cbWanted, int iTimeoutMs) const {
        auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(iTimeoutMs);
        while (std::chrono::steady_clock::now() < deadline) {
            {
                std::lock_guard<std::mutex> guard(mutex_);
                if (received_.size() >= cbWanted && !open_) return received_;
            }
            poll(nullptr, 0, 20);
        }
        return Received();
    }

private:
    void Serve() {
        while (!stop_) {
            pollfd p{fd_, POLLIN, 0};
            if (poll(&p, 1, 50) <= 0) continue;
            int conn = accept4(fd_, nullptr, nullptr, SOCK_CLOEXEC);
            if (conn < 0) continue;
            ++connections_;
            open_ = true;
            char buf[4096];
            while (!stop_) {
                pollfd c{conn, POLLIN, 0};
                if (poll(&c, 1, 50) <= 0) continue;
                ssize_t n = read(conn, buf, sizeof buf);
                if (n <= 0) break;
                std::lock_guard<std::mutex> guard(mutex_);
                received_.append(buf, static_cast<size_t>(n));
            }
            close(conn);
            open_ = false;
        }
    }

    int fd_ = -1;
    std::uint16_t port_ = 0;
    std::thread thread_;
    std::atomic<bool> stop_{false};
    std::atomic<bool> open_{false};
    std::atomic<int> connections_{0};
    mutable std::mutex mutex_;
    std::string received_;
};

}  // namespace xavo::test
