// A fixed number of argument slots for the platform's process runner, each
// holding its own heap copy of its text.  Every slot, null ones included, is
// freed when the vector goes, on every path.
#pragma once

#include <cstdlib>
#include <cstring>
#include <vector>

namespace xavo {

class ArgVector {
public:
    explicit ArgVector(size_t nSlots) : slots_(nSlots + 1, nullptr) {}  // +1: always null-terminated
    ArgVector(const ArgVector &) = delete;
    ArgVector &operator=(const ArgVector &) = delete;
    ~ArgVector() {
        for (char *p : slots_) std::free(p);
    }

    // Puts a copy of szText into slot i (freeing what was there); false when
    // the copy cannot be allocated or i is beyond the slots.
    bool Set(size_t i, const char *szText) {
        if (i + 1 >= slots_.size() || szText == nullptr) return false;
        char *p = strdup(szText);
        if (p == nullptr) return false;
        std::free(slots_[i]);
        slots_[i] = p;
        return true;
    }
    // Appends after the last filled slot.
    bool Push(const char *szText) { return Set(Used(), szText); }
    void Clear(size_t i) {
        if (i + 1 < slots_.size()) {
            std::free(slots_[i]);
            slots_[i] = nullptr;
        }
    }
    size_t Used() const {
        size_t n = 0;
        while (n + 1 < slots_.size() && slots_[n] != nullptr) ++n;
        return n;
    }
    const char *operator[](size_t i) const { return slots_[i]; }
    char *const *data() const { return slots_.data(); }

private:
    std::vector<char *> slots_;
};

}  // namespace xavo
