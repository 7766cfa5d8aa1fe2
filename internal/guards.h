// Move-only owners of everything a call opens or allocates, so that every
// path out of an operation releases it.
#pragma once

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <utility>

#include "xavocore.h"

namespace xavo {

// Generic owner of a pointer released by a free function.
template <class T, void (*Release)(T *)>
class Owner {
public:
    Owner() = default;
    explicit Owner(T *p) : p_(p) {}
    Owner(const Owner &) = delete;
    Owner &operator=(const Owner &) = delete;
    Owner(Owner &&o) noexcept : p_(std::exchange(o.p_, nullptr)) {}
    Owner &operator=(Owner &&o) noexcept {
        if (this != &o) reset(std::exchange(o.p_, nullptr));
        return *this;
    }
    ~Owner() { reset(); }

    T *get() const { return p_; }
    // The platform may move a list or hash when it grows: give it the
    // address of our pointer.
    T **addr() { return &p_; }
    T *release() { return std::exchange(p_, nullptr); }
    void reset(T *p = nullptr) {
        if (p_) Release(p_);
        p_ = p;
    }
    explicit operator bool() const { return p_ != nullptr; }

private:
    T *p_ = nullptr;
};

inline void FreeSzList(ORLICSzList *p) { ORLICSzListFree(p); }
inline void FreeSzHash(ORLICSzHash *p) { ORLICSzHashFree(p); }
inline void FreeBlock(char *p) { std::free(p); }
inline void CloseFile(FILE *p) { std::fclose(p); }

using SzList = Owner<ORLICSzList, FreeSzList>;
using SzHash = Owner<ORLICSzHash, FreeSzHash>;
using HeapText = Owner<char, FreeBlock>;
using File = Owner<FILE, CloseFile>;

// Items of a platform string list, read the way the appliance's record lays
// them out.
inline int ListCount(const ORLICSzList *p) { return p ? ORLIC_SZLIST_COUNT(p) : 0; }
inline const char *ListItem(const ORLICSzList *p, int i) { return ORLIC_SZLIST_ITEMS(p)[i]; }

// An open file descriptor.
class Fd {
public:
    Fd() = default;
    explicit Fd(int fd) : fd_(fd) {}
    Fd(const Fd &) = delete;
    Fd &operator=(const Fd &) = delete;
    Fd(Fd &&o) noexcept : fd_(std::exchange(o.fd_, -1)) {}
    Fd &operator=(Fd &&o) noexcept {
        if (this != &o) reset(std::exchange(o.fd_, -1));
        return *this;
    }
    ~Fd() { reset(); }

    int get() const { return fd_; }
    int release() { return std::exchange(fd_, -1); }
    void reset(int fd = -1) {
        if (fd_ >= 0) {
            // close() may clobber errno that a caller is about to report.
            int saved = errno;
            ::close(fd_);
            errno = saved;
        }
        fd_ = fd;
    }
    explicit operator bool() const { return fd_ >= 0; }

private:
    int fd_ = -1;
};

// A program's output stream from ORLICPopen; closed with ORLICPclose, which
// also reaps the program.  Close() reports the close result to the callers
// that look at it; the destructor closes what is left open.
class Pipe {
public:
    Pipe() = default;
    explicit Pipe(FILE *p) : p_(p) {}
    Pipe(const Pipe &) = delete;
    Pipe &operator=(const Pipe &) = delete;
    Pipe(Pipe &&o) noexcept : p_(std::exchange(o.p_, nullptr)) {}
    Pipe &operator=(Pipe &&o) noexcept {
        if (this != &o) {
            Close();
            p_ = std::exchange(o.p_, nullptr);
        }
        return *this;
    }
    ~Pipe() { Close(); }

    FILE *get() const { return p_; }
    explicit operator bool() const { return p_ != nullptr; }
    // Closes the stream and waits for the program; the close result, or 0
    // when nothing was open.
    int Close() {
        if (!p_) return 0;
        return ORLICPclose(std::exchange(p_, nullptr));
    }

private:
    FILE *p_ = nullptr;
};

// Saves errno on construction and puts it back on destruction: the network
// readers keep their caller's errno.
class ErrnoKeeper {
public:
    ErrnoKeeper() : saved_(errno) {}
    ErrnoKeeper(const ErrnoKeeper &) = delete;
    ErrnoKeeper &operator=(const ErrnoKeeper &) = delete;
    ~ErrnoKeeper() { errno = saved_; }
    int saved() const { return saved_; }

private:
    int saved_;
};

// The printer lock (the descriptor of XAVOPrinterPrinterConfLock), released
// on every path out of the writer that took it.
class PrinterLock {
public:
    PrinterLock();
    PrinterLock(const PrinterLock &) = delete;
    PrinterLock &operator=(const PrinterLock &) = delete;
    ~PrinterLock();
    bool held() const { return fd_ >= 0; }

private:
    int fd_;
};

}  // namespace xavo
