// A table of what this process owns and the caller holds no handle for
// (the programs behind ORLICPopen's streams, the named locks taken), which
// a child forked by the host does not own: the child forgets every entry.
#pragma once

#include <pthread.h>

#include <mutex>

namespace xavo::core {

// Table is a map; Forget(entry) lets go of what an entry holds without
// touching the parent's side of it.  The fork handlers are registered with
// the table's first use, which each user makes when the library is loaded,
// before the host can fork.
template <class Table, void (*Forget)(typename Table::value_type &)>
class ForkLocal {
public:
    static ForkLocal &Get() {
        static ForkLocal *self = [] {
            static ForkLocal instance;
            pthread_atfork(BeforeFork, AfterForkParent, AfterForkChild);
            return &instance;
        }();
        return *self;
    }

    // Forgets every entry; the caller holds the mutex.
    void ForgetAll() {
        for (auto &entry : table) Forget(entry);
        table.clear();
    }

    std::mutex mutex;
    Table table;

private:
    ForkLocal() = default;
    static void BeforeFork() { Get().mutex.lock(); }
    static void AfterForkParent() { Get().mutex.unlock(); }
    static void AfterForkChild() {
        ForkLocal &self = Get();
        self.ForgetAll();
        self.mutex.unlock();
    }
};

}  // namespace xavo::core
