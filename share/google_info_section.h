// The cloud print account's section of the printer configuration file, and
// a buffer for its secrets in clear.
#pragma once

#include <cstring>

namespace xavo {

inline constexpr char kGoogleSection[] = "Google Cloud Print";
inline constexpr char kKeyGoogleAccount[] = "google account";
// Both secrets are stored only as the platform cipher's output.
inline constexpr char kKeyGooglePass[] = "google pass";
inline constexpr char kKeyRefreshToken[] = "refresh token";
// Enciphered and deciphered texts are produced into buffers of this size.
inline constexpr int kCipherBufSize = 512;

// A stack buffer that is wiped when it goes, so that a secret in clear
// does not outlive the call in memory that is reused later.
template <size_t N>
class SecretBuf {
public:
    SecretBuf() { std::memset(sz_, 0, N); }
    SecretBuf(const SecretBuf &) = delete;
    SecretBuf &operator=(const SecretBuf &) = delete;
    ~SecretBuf() { explicit_bzero(sz_, N); }
    char *get() { return sz_; }
    static constexpr int size() { return static_cast<int>(N); }

private:
    char sz_[N];
};

}  // namespace xavo
