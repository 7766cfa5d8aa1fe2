// Reading a secret (a password, a refresh token) for the cloud print
// account: from a prompt without echo on a terminal, else one line of
// standard input.  Never from the command line or the environment, where
// other users of the appliance could read it.
#pragma once

#include <cstddef>
#include <optional>
#include <string>

namespace cli {

// A secret's bytes, wiped when it goes.
class Secret {
public:
    Secret() = default;
    Secret(const Secret &) = delete;
    Secret &operator=(const Secret &) = delete;
    Secret(Secret &&other) noexcept;
    Secret &operator=(Secret &&) = delete;
    ~Secret();

    std::string &text() { return text_; }
    const std::string &text() const { return text_; }

private:
    std::string text_;
};

// Reads one secret of at most `maxLength` bytes.  Returns the secret, or
// nullopt with `why` set: empty, longer than the record allows (the
// excess is read and wiped, never stored cut), or holding a NUL byte.  On
// a terminal the echo is off while the user types and is put back on every
// way out, Ctrl-C and SIGTERM included.
std::optional<Secret> ReadSecret(const std::string &what, std::size_t maxLength, std::string &why);

}  // namespace cli
