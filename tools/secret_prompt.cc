#include "secret_prompt.h"

#include <signal.h>
#include <string.h>
#include <termios.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

namespace cli {
namespace {

// The terminal's settings before the echo went off, for the signal
// handler: it may only use what it finds in static storage.
termios g_saved{};
volatile sig_atomic_t g_bEchoOff = 0;
constexpr int kSignals[] = {SIGINT, SIGTERM, SIGHUP, SIGQUIT};

extern "C" void RestoreAndDie(int sig) {
    if (g_bEchoOff != 0) {
        tcsetattr(STDIN_FILENO, TCSANOW, &g_saved);
        const char nl = '\n';
        [[maybe_unused]] ssize_t n = write(STDERR_FILENO, &nl, 1);
    }
    // Die of the signal as if nothing had caught it, so that the caller
    // sees the usual status.
    signal(sig, SIG_DFL);
    raise(sig);
}

// Echo off for its lifetime; the terminal and the signal dispositions are
// restored on every way out.
class QuietTerminal {
public:
    QuietTerminal() {
        if (tcgetattr(STDIN_FILENO, &g_saved) != 0) return;
        struct sigaction sa{};
        sa.sa_handler = RestoreAndDie;
        sigemptyset(&sa.sa_mask);
        for (size_t i = 0; i < std::size(kSignals); ++i) sigaction(kSignals[i], &sa, &old_[i]);
        termios quiet = g_saved;
        quiet.c_lflag &= ~static_cast<tcflag_t>(ECHO);
        g_bEchoOff = 1;
        if (tcsetattr(STDIN_FILENO, TCSAFLUSH, &quiet) != 0) g_bEchoOff = 0;
        bActive_ = true;
    }
    QuietTerminal(const QuietTerminal &) = delete;
    QuietTerminal &operator=(const QuietTerminal &) = delete;
    ~QuietTerminal() {
        if (!bActive_) return;
        if (g_bEchoOff != 0) tcsetattr(STDIN_FILENO, TCSANOW, &g_saved);
        g_bEchoOff = 0;
        for (size_t i = 0; i < std::size(kSignals); ++i) sigaction(kSignals[i], &old_[i], nullptr);
        std::fputc('\n', stderr);
    }

private:
    bool bActive_ = false;
    struct sigaction old_[std::size(kSignals)]{};
};

}  // namespace

Secret::Secret(Secret &&other) noexcept : text_(std::move(other.text_)) {
    explicit_bzero(other.text_.data(), other.text_.size());
    other.text_.clear();
}

Secret::~Secret() { explicit_bzero(text_.data(), text_.size()); }

std::optional<Secret> ReadSecret(const std::string &what, std::size_t maxLength, std::string &why) {
    Secret secret;
    // Room for the longest acceptable secret and one byte more, reserved
    // once: growing the string would leave copies of the secret behind.
    secret.text().reserve(maxLength + 2);
    bool bTooLong = false;
    bool bNul = false;
    {
        std::optional<QuietTerminal> quiet;
        if (isatty(STDIN_FILENO) == 1) {
            std::fprintf(stderr, "%s: ", what.c_str());
            std::fflush(stderr);
            quiet.emplace();
        }
        for (;;) {
            char c = 0;
            const ssize_t n = read(STDIN_FILENO, &c, 1);
            if (n < 0 && errno == EINTR) continue;
            if (n <= 0 || c == '\n') break;
            if (c == '\0') bNul = true;
            if (secret.text().size() <= maxLength) {
                secret.text().push_back(c);
            } else {
                bTooLong = true;
            }
        }
    }
    if (!secret.text().empty() && secret.text().back() == '\r') secret.text().pop_back();
    if (secret.text().size() > maxLength) bTooLong = true;
    if (secret.text().empty()) {
        why = "the " + what + " is empty";
    } else if (bTooLong) {
        why = "the " + what + " is longer than " + std::to_string(maxLength) + " characters";
    } else if (bNul) {
        why = "the " + what + " holds a NUL byte";
    } else {
        return secret;
    }
    return std::nullopt;
}

}  // namespace cli
