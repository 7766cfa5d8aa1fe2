// The cipher that keeps secrets (cloud print passwords and tokens) out of
// the appliance's text files in clear.
//
// Authenticated encryption (XSalsa20-Poly1305, libsodium's secretbox) with
// a fresh random nonce per text, under a key of the appliance kept in a
// root-only file.  The output is text: URL-safe base64 without padding of
// nonce and sealed box, so that it holds no blank, quote, "=" or line break
// and fits any line of the appliance's files.  A changed or truncated
// output fails to open instead of giving altered clear text.
//
// Sizes: a clear text of n bytes gives 4 * ceil((24 + 16 + n) / 3) - padding
// characters; the 255-character refresh token takes 394, well inside the
// 512-byte buffers of the callers.  An output that would not fit fails
// cleanly.  Clear text is never logged, and every copy of it and of the key
// is wiped before its memory is released.
#include <fcntl.h>
#include <sodium.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

#include "common/appliance.h"
#include "common/fd.h"
#include "common/text_files.h"

using namespace xavo::platform;

namespace {
constexpr char kUnit[] = "cipher";

constexpr char kKeyPath[] = "/usr/xavo/etc/.printer_secret.key";
constexpr char kKeyDir[] = "/usr/xavo/etc";
constexpr char kKeyTemplate[] = "/usr/xavo/etc/.printer_secret.key.XXXXXX";
constexpr mode_t kKeyMode = 0600;
constexpr mode_t kKeyDirMode = 0755;
constexpr int kBase64 = sodium_base64_VARIANT_URLSAFE_NO_PADDING;
constexpr size_t kOverhead = crypto_secretbox_NONCEBYTES + crypto_secretbox_MACBYTES;

// Key bytes that are wiped when they go out of scope.
struct Key {
    unsigned char bytes[crypto_secretbox_KEYBYTES];
    Key() = default;
    Key(const Key &) = delete;
    Key &operator=(const Key &) = delete;
    ~Key() { sodium_memzero(bytes, sizeof bytes); }
};

// A buffer for clear text that is wiped before it is released.
struct Secret {
    std::vector<unsigned char> bytes;
    explicit Secret(size_t n) : bytes(n) {}
    Secret(const Secret &) = delete;
    Secret &operator=(const Secret &) = delete;
    ~Secret() {
        if (!bytes.empty()) sodium_memzero(bytes.data(), bytes.size());
    }
};

bool ReadExactly(int fd, unsigned char *p, size_t n) {
    while (n > 0) {
        ssize_t r = ::read(fd, p, n);
        if (r < 0 && errno == EINTR) continue;
        if (r <= 0) return false;
        p += r;
        n -= static_cast<size_t>(r);
    }
    return true;
}

// Reads the key.  A key file that is not a plain root-only file of the
// right size is not used: somebody has been at it.
bool ReadKey(Key *pKey, Failure *pFailure) {
    Fd fd(::open(kKeyPath, O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NOCTTY));
    if (fd.get() < 0) {
        *pFailure = {kErrOpen, __LINE__};
        return false;
    }
    struct stat st {};
    if (::fstat(fd.get(), &st) != 0 || !S_ISREG(st.st_mode) || st.st_uid != ::geteuid() || (st.st_mode & 077) != 0 ||
        st.st_size != static_cast<off_t>(sizeof pKey->bytes)) {
        *pFailure = {kErrRead, __LINE__};
        return false;
    }
    if (!ReadExactly(fd.get(), pKey->bytes, sizeof pKey->bytes)) {
        *pFailure = {kErrRead, __LINE__};
        return false;
    }
    return true;
}

// Makes the key on first use.  The key is written to a temporary file and
// linked to its name, which fails if the name exists: a key file is always
// complete, and of two processes making one at the same time the first wins
// and the other reads it.
bool CreateKey(Failure *pFailure) {
    if (::mkdir(kKeyDir, kKeyDirMode) != 0 && errno != EEXIST) {
        *pFailure = {kErrOpen, __LINE__};
        return false;
    }
    std::string temp = kKeyTemplate;
    Fd fd(::mkostemp(temp.data(), O_CLOEXEC));  // mode 0600
    if (fd.get() < 0) {
        *pFailure = {kErrOpen, __LINE__};
        return false;
    }
    Key key;
    crypto_secretbox_keygen(key.bytes);
    const std::string_view bytes(reinterpret_cast<const char *>(key.bytes), sizeof key.bytes);
    bool bOk = ::fchmod(fd.get(), kKeyMode) == 0 && WriteAll(fd.get(), bytes) && ::fsync(fd.get()) == 0;
    if (!bOk) {
        *pFailure = {kErrWrite, __LINE__};
    } else if (::link(temp.c_str(), kKeyPath) != 0 && errno != EEXIST) {
        *pFailure = {kErrWrite, __LINE__};
        bOk = false;
    }
    ::unlink(temp.c_str());
    return bOk;
}

bool IsAlphabetChar(char c) {
    return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-' || c == '_';
}

// The sealed box of an enciphered text, only when the text is exactly what
// the cipher writes for it.  libsodium's decoder is lenient (1.0.18 reads
// bytes 0x80-0xFF as "_", and the last character's unused bits are not
// looked at), so a changed text could decode to the original box and open;
// every character is checked against the alphabet first, and the box must
// encode back to the very text.
bool DecodeExact(const char *szText, std::vector<unsigned char> *pBox) {
    const size_t len = std::strlen(szText);
    for (size_t i = 0; i < len; ++i) {
        if (!IsAlphabetChar(szText[i])) return false;
    }
    std::vector<unsigned char> box(len + 1);  // decoded is shorter than its text
    size_t n = 0;
    if (sodium_base642bin(box.data(), box.size(), szText, len, nullptr, &n, nullptr, kBase64) != 0) return false;
    box.resize(n);
    std::string again(sodium_base64_ENCODED_LEN(n, kBase64), '\0');
    sodium_bin2base64(again.data(), again.size(), box.data(), n, kBase64);
    if (std::strcmp(again.c_str(), szText) != 0) return false;
    *pBox = std::move(box);
    return true;
}

bool LoadKey(Key *pKey, bool bCreate, Failure *pFailure) {
    if (sodium_init() < 0) {
        *pFailure = {kErrOpen, __LINE__};
        return false;
    }
    if (ReadKey(pKey, pFailure)) return true;
    if (!bCreate || errno != ENOENT) return false;
    return CreateKey(pFailure) && ReadKey(pKey, pFailure);
}

}  // namespace

// Non-zero when szOut holds the enciphered text; 0 on failure (szOut then
// empty when it has room).
XAVO_PLATFORM_API int32_t ORLICCryptSzEncrypt(const char *szClear, char *szOut, int32_t cbOut) {
    if (XAVO_INJECTED()) return 0;
    if (szClear == nullptr || szOut == nullptr || cbOut <= 0) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return 0;
    }
    szOut[0] = '\0';
    return XAVO_GUARD(int32_t{0}, [&] {
        size_t clear = std::strlen(szClear);
        size_t sealed = kOverhead + clear;
        if (sodium_base64_ENCODED_LEN(sealed, kBase64) > static_cast<size_t>(cbOut)) {
            SetError(kErrBufTooSmall, kUnit, __LINE__);
            return int32_t{0};
        }
        Key key;
        Failure failure;
        if (!LoadKey(&key, true, &failure)) {
            SetError(failure.code, kUnit, failure.line);
            return int32_t{0};
        }
        std::vector<unsigned char> box(sealed);
        randombytes_buf(box.data(), crypto_secretbox_NONCEBYTES);
        crypto_secretbox_easy(box.data() + crypto_secretbox_NONCEBYTES, reinterpret_cast<const unsigned char *>(szClear),
                              clear, box.data(), key.bytes);
        sodium_bin2base64(szOut, static_cast<size_t>(cbOut), box.data(), box.size(), kBase64);
        return int32_t{1};
    });
}

// Non-zero when szOut holds the clear text; 0 when the text is not one of
// ours, was changed, or its clear text does not fit (szOut then empty).
XAVO_PLATFORM_API int32_t ORLICCryptSzDecrypt(const char *szCipher, char *szOut, int32_t cbOut) {
    if (XAVO_INJECTED()) return 0;
    if (szCipher == nullptr || szOut == nullptr || cbOut <= 0) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return 0;
    }
    szOut[0] = '\0';
    return XAVO_GUARD(int32_t{0}, [&] {
        std::vector<unsigned char> box;
        if (!DecodeExact(szCipher, &box) || box.size() < kOverhead) {
            SetError(kErrRead, kUnit, __LINE__);
            return int32_t{0};
        }
        Key key;
        Failure failure;
        if (!LoadKey(&key, false, &failure)) {
            SetError(failure.code, kUnit, failure.line);
            return int32_t{0};
        }
        const size_t sealed = box.size();
        size_t clear = sealed - kOverhead;
        Secret text(clear + 1);
        if (crypto_secretbox_open_easy(text.bytes.data(), box.data() + crypto_secretbox_NONCEBYTES,
                                       sealed - crypto_secretbox_NONCEBYTES, box.data(), key.bytes) != 0) {
            SetError(kErrRead, kUnit, __LINE__);
            return int32_t{0};
        }
        // A NUL inside would cut the text short without anybody noticing.
        if (std::memchr(text.bytes.data(), '\0', clear) != nullptr) {
            SetError(kErrRead, kUnit, __LINE__);
            return int32_t{0};
        }
        if (clear + 1 > static_cast<size_t>(cbOut)) {
            SetError(kErrBufTooSmall, kUnit, __LINE__);
            return int32_t{0};
        }
        std::memcpy(szOut, text.bytes.data(), clear);
        szOut[clear] = '\0';
        return int32_t{1};
    });
}
