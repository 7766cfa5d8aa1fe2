// The core platform stand-in (libxavocore): containers, section and
// key-value files, atomic replacement, processes, locks, strings, cipher
// and the test controls.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "appliance/standin_control.h"
#include "internal/guards.h"
#include "sandbox/sandbox.h"
#include "xavocore.h"

using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using xavo::SzHash;
using xavo::SzList;
using xavo::test::FileExists;
using xavo::test::PlaceFile;
using xavo::test::PlaceProgram;
using xavo::test::ReadFile;

namespace {

using Pairs = std::vector<std::pair<std::string, std::string>>;

constexpr char kFmt[] = "\t%s = %s\n";
constexpr char kKvFmt[] = "%s=\"%s\"\n";
constexpr char kConf[] = "/usr/xavo/etc/printer.conf";
constexpr char kTable[] = "/tmp/usbtab";

Pairs HashPairs(const ORLICSzHash *hash) {
    SzList keys(ORLICSzListAlloc(16));
    int n = ORLICSzHashEnumKey(hash, keys.addr());
    Pairs out;
    for (int i = 0; i < n; ++i) {
        const char *key = ORLICSzListGet(keys.get(), i);
        out.emplace_back(key, ORLICSzHashGetValue(hash, key));
    }
    return out;
}

SzHash MakeHash(const Pairs &pairs) {
    SzHash hash(ORLICSzHashAlloc(512));
    for (const auto &[k, v] : pairs) ORLICSzHashSetValue(hash.addr(), k.c_str(), v.c_str());
    return hash;
}

// The section's pairs in file order, with the read's result.
std::pair<int, Pairs> GetSection(const char *path, const char *name) {
    SzHash hash(ORLICSzHashAlloc(512));
    int r = ORLICFileGetSection(path, name, hash.addr());
    return {r, HashPairs(hash.get())};
}

struct stat Stat(const char *path) {
    struct stat st {};
    EXPECT_EQ(lstat(path, &st), 0) << path;
    return st;
}

std::string ReadAll(FILE *stream) {
    std::string text;
    char line[512];
    while (fgets(line, sizeof line, stream) != nullptr) text += line;
    return text;
}

void PauseMs(int ms) { poll(nullptr, 0, ms); }

double Seconds(std::chrono::steady_clock::time_point since) {
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - since).count();
}

// ---- string lists and hashes ------------------------------------------------

TEST(PlatformContainers, ListRecordKeepsCountInWordOneAndItemsFromWordSix) {
    SzList list(ORLICSzListAlloc(2));
    std::vector<std::string> want;
    for (int i = 0; i < 40; ++i) {
        want.push_back("item" + std::to_string(i));
        ASSERT_EQ(ORLICSzListPush(list.addr(), want.back().c_str()), i + 1);
    }
    // Read the record as a caller of the appliance's library does, by words.
    const auto *words = reinterpret_cast<const int32_t *>(list.get());
    ASSERT_EQ(words[1], 40);
    const char *const *items = reinterpret_cast<const char *const *>(words + 6);
    for (int i = 0; i < 40; ++i) EXPECT_STREQ(items[i], want[i].c_str());
    EXPECT_EQ(ORLICSzListGet(list.get(), 40), nullptr);
    EXPECT_EQ(ORLICSzListGet(list.get(), -1), nullptr);
}

TEST(PlatformContainers, HashKeepsInsertionOrderAndHeldValuesThroughGrowth) {
    SzHash hash(ORLICSzHashAlloc(4));
    ORLICSzHash *before = hash.get();
    ASSERT_EQ(ORLICSzHashSetValue(hash.addr(), "first", "1"), 0);
    const char *held = ORLICSzHashGetValue(hash.get(), "first");
    Pairs want{{"first", "1"}};
    for (int i = 0; i < 100; ++i) {
        std::string k = "k" + std::to_string(i);
        ASSERT_EQ(ORLICSzHashSetValue(hash.addr(), k.c_str(), "v"), 0);
        want.emplace_back(k, "v");
    }
    EXPECT_NE(hash.get(), before) << "growth moves the hash; callers must use the stored pointer";
    EXPECT_STREQ(held, "1");
    ORLICSzHashSetValue(hash.addr(), "k5", "replaced");
    want[6].second = "replaced";
    ORLICSzHashRemoveKey(hash.get(), "k0");
    want.erase(want.begin() + 1);
    EXPECT_EQ(HashPairs(hash.get()), want);
    EXPECT_EQ(ORLICSzHashGetValue(hash.get(), "K5"), nullptr) << "keys compare exactly";
}

// ---- section files ------------------------------------------------------------

struct SectionReadCase {
    const char *text;
    Pairs want;
    int lines;  // key lines read
};

TEST(PlatformSectionFile, ReadsWhatSambaReads) {
    const SectionReadCase cases[] = {
        {"[p]\n\tkey = value\n", {{"key", "value"}}, 1},
        {"# comment\n; other\n\n[p]\n  a=1  \r\n\n# x = y\n;b=2\nc =  spaced value \nno equals\n[q]\nd = 4\n",
         {{"a", "1"}, {"c", "spaced value"}}, 2},
        {"global = 1\n[p]\nk = first\nk = last\n", {{"k", "last"}}, 2},
        {"[p]\na = 1\n[q]\nb = 2\n[p]\nc = 3\n", {{"a", "1"}, {"c", "3"}}, 2},
        {"  [p]  \nv = x = y\n", {{"v", "x = y"}}, 1},
        {"[p]\nempty =\n", {{"empty", ""}}, 1},
    };
    for (const auto &c : cases) {
        PlaceFile(kConf, c.text);
        auto [n, pairs] = GetSection(kConf, "p");
        EXPECT_EQ(pairs, c.want) << c.text;
        EXPECT_EQ(n, c.lines) << c.text;
    }
}

TEST(PlatformSectionFile, HostileSectionNamesRoundTrip) {
    const char *names[] = {"04b8:0005:S]N=1", "[x", "a]b]", "x=y;z #q", " lead", "Google Cloud Print"};
    for (const char *name : names) {
        ASSERT_EQ(ORLICFileAddSection(kConf, name, MakeHash({{"name", name}}).get(), kFmt), 1) << name;
    }
    for (const char *name : names) {
        // Values lose the blanks at their ends, as Samba reads them; names
        // keep them.
        auto [n, pairs] = GetSection(kConf, name);
        EXPECT_EQ(n, 1) << name;
        std::string value = name;
        value.erase(0, value.find_first_not_of(' '));
        EXPECT_EQ(pairs, (Pairs{{"name", value}})) << name;
    }
}

TEST(PlatformSectionFile, ControlCharactersInValuesBecomeBlanks) {
    ASSERT_EQ(ORLICFileAddSection(kConf, "p", MakeHash({{"usblp string id", "MFG:X;\nMDL:Y;\r\n\x7f"}}).get(), kFmt),
              1);
    EXPECT_EQ(ReadFile(kConf), "[p]\n\tusblp string id = MFG:X; MDL:Y;   \n");
    ASSERT_EQ(ORLICFileSetSectionValue(kConf, "p", "comment", "a\nforged = 1"), 0);
    EXPECT_EQ(GetSection(kConf, "p").second,
              (Pairs{{"usblp string id", "MFG:X; MDL:Y;"}, {"comment", "a forged = 1"}}));
}

TEST(PlatformSectionFile, RefusesNamesAndKeysThatWouldNotReadBack) {
    PlaceFile(kConf, "[p]\nk = v\n");
    struct Case {
        const char *name;
        const char *key;
    } cases[] = {{"p\nq", "k"}, {"new\n[p]", "k"}, {"", "k"}, {"q", "k\nforged"},
                 {"q", "a=b"},  {"q", "#k"},       {"q", " k"}, {"q", "[k]"}};
    for (const auto &c : cases) {
        ORLICErrSetEx(0, "", 0);
        EXPECT_LT(ORLICFileAddSection(kConf, c.name, MakeHash({{c.key, "v"}}).get(), kFmt), 0) << c.name << c.key;
        EXPECT_EQ(ORLICErrGet(), 0x0D00u);
        EXPECT_LT(ORLICFileSetSection(kConf, "p", c.name, MakeHash({{c.key, "v"}}).get(), kFmt), 0);
    }
    EXPECT_LT(ORLICFileSetSectionValue(kConf, "p", "k\n", "v"), 0);
    EXPECT_LT(ORLICFileAddSection(kConf, "q", MakeHash({{"k", "v"}}).get(), "%s %d\n"), 0) << "bad format";
    EXPECT_EQ(ReadFile(kConf), "[p]\nk = v\n");
}

TEST(PlatformSectionFile, WritersChangeOnlyTheirSectionOrKey) {
    // Adding a section that exists already changes nothing, not even the inode.
    const std::string text = "# keep\n[p]\n k=v\n";
    PlaceFile(kConf, text, 0640);
    const ino_t inode = Stat(kConf).st_ino;
    EXPECT_EQ(ORLICFileAddSection(kConf, "p", MakeHash({{"other", "x"}}).get(), kFmt), 0);
    EXPECT_EQ(ReadFile(kConf), text);
    EXPECT_EQ(Stat(kConf).st_ino, inode);

    PlaceFile(kConf,
              "# head\n[a]\n\tx = 1\n; about b\n[b]\n\told = 1\n\tgone = 2\n\n# about c\n[c]\n\ty = 2\n[b]\n\tdup = 3\n");
    ASSERT_EQ(ORLICFileSetSection(kConf, "b", "b", MakeHash({{"new", "n"}, {"old", "o"}}).get(), kFmt), 1);
    EXPECT_EQ(ReadFile(kConf),
              "# head\n[a]\n\tx = 1\n; about b\n[b]\n\tnew = n\n\told = o\n\n# about c\n[c]\n\ty = 2\n");
    // A missing old section is added; renaming onto another section is not.
    ASSERT_EQ(ORLICFileSetSection(kConf, "d", "d", MakeHash({{"z", "1"}}).get(), kFmt), 1);
    EXPECT_THAT(ReadFile(kConf), HasSubstr("\ty = 2\n[d]\n\tz = 1\n"));
    EXPECT_LT(ORLICFileSetSection(kConf, "d", "a", MakeHash({}).get(), kFmt), 0);

    // A single key is set in place, or added after the section's keys ("name"
    // is not "cups printer name"), also in a last line without its newline.
    PlaceFile(kConf, "[p]\n\ta = 1\n\tname = old\n\n[q]\n\tb = 2");
    ASSERT_EQ(ORLICFileSetSectionValue(kConf, "p", "name", "usbprinter1"), 0);
    ASSERT_EQ(ORLICFileSetSectionValue(kConf, "p", "cups printer name", "usbprinter2"), 0);
    ASSERT_EQ(ORLICFileSetSectionValue(kConf, "q", "c", "3"), 0);
    EXPECT_EQ(ReadFile(kConf),
              "[p]\n\ta = 1\n\tname = usbprinter1\n\tcups printer name = usbprinter2\n\n[q]\n\tb = 2\n\tc = 3\n");
}

TEST(PlatformSectionFile, MissingFileSectionOrKeyFailsWithTheHashUntouched) {
    char buf[8];
    struct Case {
        const char *text;  // nullptr: no file
        const char *section;
        const char *key;
        uint32_t code;
    } cases[] = {{nullptr, "p", "k", 0x0900}, {"[q]\nk = v\n", "p", "k", 0x2600}, {"[p]\nj = v\n", "p", "k", 0x2000}};
    for (const auto &c : cases) {
        if (c.text != nullptr) PlaceFile(kConf, c.text);
        SzHash hash = MakeHash({{"kept", "1"}});
        if (c.code != 0x2000) {
            EXPECT_LT(ORLICFileGetSection(kConf, c.section, hash.addr()), 0);
            EXPECT_EQ(ORLICErrGet(), c.code);
            EXPECT_EQ(HashPairs(hash.get()), (Pairs{{"kept", "1"}}));
            EXPECT_LT(ORLICFileSetSectionValue(kConf, c.section, c.key, "v"), 0);
        }
        EXPECT_LT(ORLICFileGetSectionValue(kConf, c.section, c.key, buf, sizeof buf), 0);
        EXPECT_EQ(ORLICErrGet(), c.code);
    }
    PlaceFile(kConf, "[p]\nk = 0123456789\n");
    EXPECT_EQ(ORLICFileGetSectionValue(kConf, "p", "k", buf, sizeof buf), 7) << "cut to fit";
    EXPECT_STREQ(buf, "0123456");
}

TEST(PlatformSectionFile, TestparmAcceptsTheShareFileAsWritten) {
    const char *share = "/tmp/testparm/smb.reserved.conf";
    PlaceFile("/tmp/testparm/.keep", "");
    SzHash hash = MakeHash({{"comment", "All Printers\nforged = yes"},
                            {"path", "/var/services/printer"},
                            {"printable", "yes"},
                            {"guest ok", "yes"},
                            {"browseable", "no"}});
    ASSERT_EQ(ORLICFileAddSection(share, "printers", hash.get(), kFmt), 1);
    FILE *out = ORLICPopen("/bin/sh", "r", "-c", "exec /usr/bin/testparm -s \"$0\" 2>/dev/null", share, nullptr);
    ASSERT_NE(out, nullptr);
    const std::string dump = ReadAll(out);
    EXPECT_EQ(ORLICPclose(out), 0);
    // testparm lists a section's parameters sorted by name.
    EXPECT_THAT(dump, HasSubstr("[printers]\n\tbrowseable = No\n\tcomment = All Printers forged = yes\n\tguest ok = Yes\n"
                                "\tpath = /var/services/printer\n\tprintable = Yes\n"));
}

// ---- atomic replacement ----------------------------------------------------------

// Each writer of the platform, as a test drives it.
struct Writer {
    const char *name;
    const char *path;
    int32_t (*write)(const char *path);
};
const Writer kWriters[] = {
    {"section add", kConf,
     [](const char *p) { return ORLICFileAddSection(p, "new", MakeHash({{"k", "v"}}).get(), kFmt); }},
    {"section set", kConf,
     [](const char *p) { return ORLICFileSetSection(p, "p", "p", MakeHash({{"k", "v"}}).get(), kFmt); }},
    {"section value", kConf, [](const char *p) { return ORLICFileSetSectionValue(p, "p", "k", "v"); }},
    {"key set", kTable, [](const char *p) { return ORLICFileSetKeyValue(p, "lp0", "1-1", kKvFmt); }},
    {"key remove", kTable, [](const char *p) { return ORLICFileRemoveKey(p, "lp1"); }},
};
constexpr char kStartText[] = "[p]\n\tk = old\nlp1=\"x\"\n";

TEST(PlatformAtomicWrite, ReplacesTheFileKeepingModeAndOwnerButNeverThroughASymlink) {
    for (const Writer &w : kWriters) {
        SCOPED_TRACE(w.name);
        PlaceFile(w.path, kStartText, 0640);
        ASSERT_EQ(chown(w.path, 123, 456), 0);
        struct stat before = Stat(w.path);
        EXPECT_GE(w.write(w.path), 0);
        struct stat after = Stat(w.path);
        EXPECT_NE(ReadFile(w.path), kStartText);
        EXPECT_NE(after.st_ino, before.st_ino) << "replaced, not rewritten in place";
        EXPECT_EQ(after.st_mode & 07777, 0640u);
        EXPECT_EQ(after.st_uid, 123u);
        EXPECT_EQ(after.st_gid, 456u);

        PlaceFile("/tmp/victim", kStartText);
        unlink(w.path);
        ASSERT_EQ(symlink("/tmp/victim", w.path), 0);
        ORLICErrSetEx(0, "", 0);
        EXPECT_LT(w.write(w.path), 0);
        EXPECT_EQ(ORLICErrGet(), 0x0900u);
        EXPECT_TRUE(S_ISLNK(Stat(w.path).st_mode));
        EXPECT_EQ(ReadFile("/tmp/victim"), kStartText);
        unlink(w.path);
    }
    ASSERT_EQ(ORLICFileSetKeyValue("/tmp/fresh", "k", "v", kKvFmt), 0);
    EXPECT_EQ(Stat("/tmp/fresh").st_mode & 07777, 0644u);
}

TEST(PlatformAtomicWrite, ReadersAndKilledWritersSeeTheOldOrTheNewFile) {
    // Two large versions of a section, written alternately by a child that
    // is killed at a random moment while this process keeps reading.
    const size_t kSize = 256 * 1024;
    const std::string a(kSize, 'A'), b(kSize, 'B');
    const std::string textA = "[p]\n\tv = " + a + "\n", textB = "[p]\n\tv = " + b + "\n";
    PlaceFile(kConf, textA);
    std::mt19937 random(20240607);
    int reads = 0;
    for (int round = 0; round < 30; ++round) {
        pid_t pid = fork();
        ASSERT_GE(pid, 0);
        if (pid == 0) {
            for (int i = 0;; ++i) ORLICFileSetSection(kConf, "p", "p", MakeHash({{"v", i % 2 ? a : b}}).get(), kFmt);
        }
        auto until = std::chrono::steady_clock::now() + std::chrono::microseconds(5000 + random() % 60000);
        while (std::chrono::steady_clock::now() < until) {
            std::string text = ReadFile(kConf);
            ++reads;
            if (text != textA && text != textB) {
                kill(pid, SIGKILL);
                waitpid(pid, nullptr, 0);
                FAIL() << "round " << round << ": read " << text.size() << " bytes";
            }
        }
        kill(pid, SIGKILL);
        ASSERT_EQ(waitpid(pid, nullptr, 0), pid);
        std::string text = ReadFile(kConf);
        ASSERT_TRUE(text == textA || text == textB) << "round " << round << ": " << text.size() << " bytes";
    }
    EXPECT_GT(reads, 100);
}

// ---- key-value files ------------------------------------------------------------

TEST(PlatformKeyValueFile, SetReplacesOneLineAndCreatesAMissingTable) {
    ASSERT_EQ(ORLICFileSetKeyValue(kTable, "lp0", "1-1.2", kKvFmt), 0);
    EXPECT_EQ(ReadFile(kTable), "lp0=\"1-1.2\"\n");
    PlaceFile(kTable, "# table\nlp0=\"a\"\nother=\"x\"\nlp0=\"b\"\nlast=\"y\"");
    ASSERT_EQ(ORLICFileSetKeyValue(kTable, "lp0", "1-2", kKvFmt), 0);
    ASSERT_EQ(ORLICFileSetKeyValue(kTable, "lp1", "1-3", kKvFmt), 0);
    EXPECT_EQ(ReadFile(kTable), "# table\nlp0=\"1-2\"\nother=\"x\"\nlast=\"y\"\nlp1=\"1-3\"\n");
    char buf[16];
    EXPECT_EQ(ORLICFileGetKeyValue(kTable, "lp0", buf, sizeof buf, 0), 3);
    EXPECT_STREQ(buf, "1-2");
}

TEST(PlatformKeyValueFile, ReadsPairsWithoutQuotesAndFailsOnlyForMissingThings) {
    SzHash hash(ORLICSzHashAlloc(16));
    EXPECT_LE(ORLICFileGetPair(kTable, hash.addr()), 0);
    EXPECT_THAT(HashPairs(hash.get()), IsEmpty());
    char buf[16];
    EXPECT_LT(ORLICFileGetKeyValue(kTable, "lp0", buf, sizeof buf, 0), 0);
    EXPECT_EQ(ORLICFileRemoveKey(kTable, "lp0"), 0) << "nothing to remove is no failure";
    EXPECT_FALSE(FileExists(kTable));

    PlaceFile(kTable, "");
    EXPECT_EQ(ORLICFileGetPair(kTable, hash.addr()), 0);
    PlaceFile(kTable, "lp0=\"1-1\"\n  QUEUE = \"Ready (3 jobs)\" \nbare=plain\n# c=\"d\"\nlp0=\"1-2\"\n");
    EXPECT_EQ(ORLICFileGetPair(kTable, hash.addr()), 4);
    EXPECT_EQ(HashPairs(hash.get()), (Pairs{{"lp0", "1-2"}, {"QUEUE", "Ready (3 jobs)"}, {"bare", "plain"}}));
    EXPECT_LT(ORLICFileGetKeyValue(kTable, "LOCK", buf, sizeof buf, 0), 0);
    EXPECT_EQ(ORLICErrGet(), 0x2000u);
    EXPECT_EQ(ORLICFileRemoveKey(kTable, "lp0"), 2);
    EXPECT_EQ(ReadFile(kTable), "  QUEUE = \"Ready (3 jobs)\" \nbare=plain\n# c=\"d\"\n");
}

// ---- string helpers -----------------------------------------------------------

struct SplitCase {
    const char *text;
    const char *delims;
    std::vector<std::string> sep;
    std::vector<std::string> tok;
};

TEST(PlatformStrings, SepKeepsEmptyFieldsAndTokDropsThem) {
    const SplitCase cases[] = {
        {"a==b", "=", {"a", "", "b"}, {"a", "b"}},
        {"", "=", {""}, {}},
        {"=a=", "=", {"", "a", ""}, {"a"}},
        {"x, y ,z", ", ", {"x", "", "y", "", "z"}, {"x", "y", "z"}},
        {"plain", ":", {"plain"}, {"plain"}},
    };
    for (const auto &c : cases) {
        SzList sep(ORLICSzListAlloc(1)), tok(ORLICSzListAlloc(1));
        ORLICSzListPush(sep.addr(), "kept");
        EXPECT_EQ(ORLICStrSep(c.text, c.delims, sep.addr()), static_cast<int>(c.sep.size())) << c.text;
        EXPECT_EQ(ORLICStrTok(c.text, c.delims, tok.addr()), static_cast<int>(c.tok.size())) << c.text;
        std::vector<std::string> gotSep, gotTok;
        for (int i = 1; i < ORLIC_SZLIST_COUNT(sep.get()); ++i) gotSep.emplace_back(ORLICSzListGet(sep.get(), i));
        for (int i = 0; i < ORLIC_SZLIST_COUNT(tok.get()); ++i) gotTok.emplace_back(ORLICSzListGet(tok.get(), i));
        EXPECT_EQ(gotSep, c.sep) << c.text;
        EXPECT_EQ(gotTok, c.tok) << c.text;
    }
}

TEST(PlatformStrings, TrimLowerAndCatWorkInTheirBuffers) {
    const std::pair<const char *, const char *> trims[] = {
        {"  x y \r\n", "x y"}, {"\t\n", ""}, {"", ""}, {"z", "z"}};
    for (const auto &[in, want] : trims) {
        char buf[32];
        std::strcpy(buf, in);
        EXPECT_EQ(ORLICStrTrim(buf, 0, 0), buf);
        EXPECT_STREQ(buf, want);
    }
    char lower[5];
    EXPECT_STREQ(ORLICStrCaseLower("IPP-Socket", 0, lower, sizeof lower), "ipp-");

    char *text = nullptr;
    int32_t cb = 0;
    std::string want;
    for (int i = 0; i < 500; ++i) {
        std::string piece = "line " + std::to_string(i) + "\n";
        want += piece;
        ASSERT_EQ(ORLICStrCat(&text, &cb, piece.c_str()), static_cast<int32_t>(want.size()));
    }
    EXPECT_EQ(text, want);
    EXPECT_GT(cb, static_cast<int32_t>(want.size()));
    free(text);
}

// ---- processes ------------------------------------------------------------------

// A program that writes its arguments, one a line, to a file.
constexpr char kArgsProgram[] = "/usr/bin/xavo-show-args";
constexpr char kArgsFile[] = "/tmp/args";
void PlaceArgsProgram() { PlaceProgram(kArgsProgram, "#!/bin/sh\nprintf '%s\\n' \"$@\" > /tmp/args\n"); }

TEST(PlatformProcess, PopenPassesTheArgumentsAsGivenReportsTheStatusAndRefusesAMissingProgram) {
    PlaceProgram(kArgsProgram, "#!/bin/sh\nprintf '%s\\n' \"$@\"\nexit 4\n");
    FILE *out = ORLICPopen(kArgsProgram, "r", "-v", nullptr);
    ASSERT_NE(out, nullptr);
    EXPECT_EQ(ReadAll(out), "-v\n");
    EXPECT_EQ(ORLICPclose(out), 4);
    EXPECT_EQ(ORLICErrGet(), 0x2A00u);
    out = ORLICPopen(kArgsProgram, "r", "a b", "$(touch /tmp/pwned)", "*", nullptr);
    ASSERT_NE(out, nullptr);
    EXPECT_EQ(ReadAll(out), "a b\n$(touch /tmp/pwned)\n*\n");
    ORLICPclose(out);
    EXPECT_FALSE(FileExists("/tmp/pwned"));

    ORLICErrSetEx(0, "", 0);
    EXPECT_EQ(ORLICPopen("/usr/bin/xavo-no-such-program", "r", "-v", nullptr), nullptr);
    EXPECT_EQ(ORLICErrGet(), 0x2A00u);
    EXPECT_EQ(ORLICExec("/usr/bin/xavo-no-such-program", nullptr, nullptr, nullptr, nullptr), -1);
    EXPECT_EQ(ORLICErrGet(), 0x2A00u);
    EXPECT_LT(ORLICPclose(stdin), 0) << "not a stream of ORLICPopen";
}

TEST(PlatformProcess, ChildGetsNullInputNoInheritedDescriptorsAndTheCLocale) {
    int leaked = open("/dev/null", O_RDONLY);  // no O_CLOEXEC on purpose
    ASSERT_GE(leaked, 3);
    setenv("LANG", "de_DE.UTF-8", 1);
    setenv("XAVO_CALLERS_SECRET", "x", 1);
    FILE *out = ORLICPopen("/bin/sh", "r", "-c", "ls /proc/self/fd; readlink /proc/self/fd/0; env | sort", nullptr);
    ASSERT_NE(out, nullptr);
    std::string text = ReadAll(out);
    EXPECT_EQ(ORLICPclose(out), 0);
    unsetenv("LANG");
    unsetenv("XAVO_CALLERS_SECRET");
    close(leaked);
    // ls has its own directory descriptor 3 open while it lists.
    EXPECT_THAT(text, HasSubstr("0\n1\n2\n3\n/dev/null\n")) << text;
    EXPECT_THAT(text, HasSubstr("LC_ALL=C\n"));
    EXPECT_THAT(text, HasSubstr("PATH="));
    EXPECT_THAT(text, Not(HasSubstr("LANG=")));
    EXPECT_THAT(text, Not(HasSubstr("XAVO_CALLERS_SECRET")));
}

TEST(PlatformProcess, ResultsTellSuccessFailureAndSignals) {
    struct Case {
        const char *script;
        int32_t want;
    } cases[] = {{"exit 0", 0}, {"exit 1", 1}, {"exit 255", 255}, {"kill -9 $$", 128 + 9}};
    for (const auto &c : cases) {
        EXPECT_EQ(ORLICExec("/bin/sh", "-c", c.script, nullptr, nullptr), c.want) << c.script;
        char *argv[] = {const_cast<char *>("sh"), const_cast<char *>("-c"), const_cast<char *>(c.script), nullptr};
        EXPECT_EQ(ORLICExecv("/bin/sh", argv, 1), c.want) << c.script;
        EXPECT_EQ(ORLICExecl("/bin/sh", 0xBB, "-c", c.script, nullptr), c.want) << c.script;
    }
    // The first null slot ends the arguments.
    PlaceArgsProgram();
    ASSERT_EQ(ORLICExec(kArgsProgram, "-z", nullptr, "ignored", nullptr), 0);
    EXPECT_EQ(ReadFile(kArgsFile), "-z\n");
}

TEST(PlatformProcess, ChildrenAreReapedWhenTheHostIgnoresSigchld) {
    struct sigaction ignore {}, old {};
    ignore.sa_handler = SIG_IGN;
    ASSERT_EQ(sigaction(SIGCHLD, &ignore, &old), 0);
    EXPECT_EQ(ORLICExec("/bin/sh", "-c", "exit 3", nullptr, nullptr), 3);
    FILE *out = ORLICPopen("/bin/sh", "r", "-c", "echo hi; exit 5", nullptr);
    ASSERT_NE(out, nullptr);
    EXPECT_EQ(ReadAll(out), "hi\n");
    EXPECT_EQ(ORLICPclose(out), 5);
    struct sigaction now {};
    sigaction(SIGCHLD, &old, &now);
    EXPECT_EQ(now.sa_handler, SIG_IGN) << "the host's setting is back";
    for (const auto &p : xavo::test::Descendants()) ADD_FAILURE() << "left: " << p.pid << " " << p.state;
}

TEST(PlatformProcess, ExecExpandsOnlyAbsolutePatternsAndKeepsLiteralNames) {
    PlaceArgsProgram();
    for (const char *f : {"/tmp/g/a.txt", "/tmp/g/b.txt", "/tmp/g/x[1].txt", "/tmp/g/x1.txt", "/tmp/g/.hidden.txt"}) {
        PlaceFile(f, "");
    }
    struct Case {
        const char *arg;
        const char *want;
    } cases[] = {
        {"/tmp/g/*.txt", "/tmp/g/a.txt\n/tmp/g/b.txt\n/tmp/g/x1.txt\n/tmp/g/x[1].txt\n"},
        {"/tmp/g/?.txt", "/tmp/g/a.txt\n/tmp/g/b.txt\n"},
        {"/tmp/g/x[1].txt", "/tmp/g/x[1].txt\n"},
        {"/tmp/g/none*", "/tmp/g/none*\n"},
        {"g/*.txt", "g/*.txt\n"},
        {"*", "*\n"},
        {"/tmp/g/$(touch /tmp/pwned);*", "/tmp/g/$(touch /tmp/pwned);*\n"},
    };
    for (const auto &c : cases) {
        ASSERT_EQ(ORLICExec(kArgsProgram, c.arg, nullptr, nullptr, nullptr), 0) << c.arg;
        EXPECT_EQ(ReadFile(kArgsFile), c.want) << c.arg;
    }
    EXPECT_FALSE(FileExists("/tmp/pwned"));
}

TEST(PlatformProcess, ProcessLookupSeesLiveProcessesOnly) {
    PlaceFile("/tmp/xavo-sleeper", ReadFile("/bin/sleep"), 0755);
    pid_t pid = -1;
    char *argv[] = {const_cast<char *>("xavo-sleeper"), const_cast<char *>("30"), nullptr};
    ASSERT_EQ(posix_spawn(&pid, "/tmp/xavo-sleeper", nullptr, nullptr, argv, nullptr), 0);
    for (int i = 0; i < 100 && ORLICIsProcAlive("xavo-sleeper") == 0; ++i) PauseMs(10);
    EXPECT_EQ(ORLICIsProcAlive("xavo-sleeper"), 1);
    kill(pid, SIGKILL);
    siginfo_t info{};
    waitid(P_PID, static_cast<id_t>(pid), &info, WEXITED | WNOWAIT);  // a zombie now
    EXPECT_EQ(ORLICIsProcAlive("xavo-sleeper"), 0);
    waitpid(pid, nullptr, 0);

    EXPECT_EQ(ORLIServiceIsRunning("no-such-service"), -1);
    EXPECT_EQ(ORLICErrGet(), 0x0D00u);
    PlaceProgram("/usr/sbin/avahi-daemon", "#!/bin/sh\nexit 1\n");
    EXPECT_LT(ORLIServiceStart("avahi", 0), 0);
    EXPECT_EQ(ORLICErrGet(), 0x2A00u);
}

// ---- locks -------------------------------------------------------------------------

TEST(PlatformLock, LockFileIsTakenOnceAndRefusedAtOnceWhileHeld) {
    const char *path = "/run/xavo-test/deep/lock_file";
    int32_t fd = -1;
    ASSERT_EQ(ORLICFileLockByFile(path, 1, &fd), 1);
    EXPECT_EQ(Stat("/run/xavo-test/deep").st_mode & 07777, 0755u);
    EXPECT_NE(fcntl(fd, F_GETFD) & FD_CLOEXEC, 0);
    auto start = std::chrono::steady_clock::now();
    int32_t other = -1;
    EXPECT_NE(ORLICFileLockByFile(path, 1, &other), 1);
    EXPECT_LT(Seconds(start), 0.1);
    close(fd);
    ASSERT_EQ(ORLICFileLockByFile(path, 1, &other), 1);
    close(other);
}

TEST(PlatformLock, UsbIdMapIsHeldBetweenLockAndUnlockAcrossProcesses) {
    ASSERT_EQ(ORLICFileLock(0x20006, 15), 0);
    // A forked child does not inherit the lock: it waits its timeout and
    // fails.
    auto start = std::chrono::steady_clock::now();
    pid_t pid = fork();
    ASSERT_GE(pid, 0);
    if (pid == 0) _exit(ORLICFileLock(0x20006, 1) == -1 && ORLICErrGet() == 0x0400 ? 0 : 1);
    int status = 0;
    ASSERT_EQ(waitpid(pid, &status, 0), pid);
    EXPECT_EQ(status, 0);
    EXPECT_GE(Seconds(start), 0.9);
    EXPECT_LT(Seconds(start), 3.0);

    ASSERT_EQ(ORLICFileUnlock(0x20000), 0);
    EXPECT_EQ(ORLICFileUnlock(0x20000), -1);
    EXPECT_EQ(ORLICErrGet(), 0x0500u);
    pid = fork();
    ASSERT_GE(pid, 0);
    if (pid == 0) _exit(ORLICFileLock(0x20006, 15) == 0 && ORLICFileUnlock(0x20000) == 0 ? 0 : 1);
    ASSERT_EQ(waitpid(pid, &status, 0), pid);
    EXPECT_EQ(status, 0);
    EXPECT_THAT(xavo::test::TakeSleeps(), IsEmpty()) << "the platform waits without sleep()/usleep()";
    EXPECT_EQ(ORLICFileLock(0x30006, 1), -1) << "unknown lock";
}

// ---- cipher -------------------------------------------------------------------------

// Round trips, damage and the cut are pinned through the cloud print
// settings too; here what those cannot see: the alphabet, a fresh nonce
// each time, the key file, and cipher texts of another key or none.
TEST(PlatformCipher, SealsWithAFreshNonceAndOpensOnlyItsOwnUnchangedText) {
    char sealed[512], again[512], opened[512];
    for (const std::string &clear : {std::string(""), std::string("pa ss\"word\n;=[x]"), std::string(255, 'z')}) {
        ASSERT_NE(ORLICCryptSzEncrypt(clear.c_str(), sealed, sizeof sealed), 0) << clear;
        EXPECT_EQ(std::string(sealed).find_first_not_of("ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_"),
                  std::string::npos);
        ASSERT_NE(ORLICCryptSzDecrypt(sealed, opened, sizeof opened), 0);
        EXPECT_EQ(opened, clear);
        ORLICCryptSzEncrypt(clear.c_str(), again, sizeof again);
        EXPECT_STRNE(again, sealed) << "a fresh nonce every time";
    }
    struct stat key = Stat("/usr/xavo/etc/.printer_secret.key");
    EXPECT_EQ(key.st_mode & 07777, 0600u);
    EXPECT_EQ(key.st_size, 32);

    for (const std::string &text : {std::string(sealed).substr(0, 40), std::string("not base64!"), std::string("")}) {
        std::strcpy(opened, "dirty");
        EXPECT_EQ(ORLICCryptSzDecrypt(text.c_str(), opened, sizeof opened), 0) << text;
        EXPECT_STREQ(opened, "");
    }
    EXPECT_EQ(ORLICCryptSzEncrypt(std::string(400, 'x').c_str(), again, sizeof again), 0) << "does not fit";
    EXPECT_EQ(ORLICErrGet(), 0x0100u);
    // A key file someone else could read is not used.
    ASSERT_EQ(chmod("/usr/xavo/etc/.printer_secret.key", 0644), 0);
    EXPECT_EQ(ORLICCryptSzDecrypt(sealed, opened, sizeof opened), 0);
}

// ---- test controls ----------------------------------------------------------------

TEST(PlatformControls, FailsTheChosenCallWithItsFailureValueAndCode) {
    XavoStandinFailCall("ORLICSzHashAlloc", 2, 0x0200);
    SzHash first(ORLICSzHashAlloc(8));
    EXPECT_NE(first.get(), nullptr);
    EXPECT_EQ(XavoStandinLastFailed(), nullptr);
    EXPECT_EQ(ORLICSzHashAlloc(8), nullptr);
    EXPECT_EQ(ORLICErrGet(), 0x0200u);
    EXPECT_STREQ(XavoStandinLastFailed(), "ORLICSzHashAlloc");
    EXPECT_EQ(XavoStandinCallCount("ORLICSzHashAlloc"), 2);

    // "*": the nth call of any operation that can fail; lookups never fail.
    XavoStandinReset();
    XavoStandinFailCalls("*", 2, -1, 0x0900);
    EXPECT_EQ(ORLICSzHashSetValue(first.addr(), "k", "v"), 0);
    EXPECT_STREQ(ORLICSzHashGetValue(first.get(), "k"), "v");
    EXPECT_LT(ORLICFileSetKeyValue(kTable, "lp0", "1-1", kKvFmt), 0);
    EXPECT_EQ(ORLICErrGet(), 0x0900u);
    EXPECT_FALSE(FileExists(kTable));
    EXPECT_EQ(ORLICExec("/bin/true", nullptr, nullptr, nullptr, nullptr), -1);
    EXPECT_EQ(XavoStandinCallCount("*"), 3);
    EXPECT_EQ(XavoStandinCallCount("ORLICSzHashGetValue"), 1);
}

TEST(PlatformControls, FailedReleasesStillRelease) {
    FILE *out = ORLICPopen("/bin/true", "r", nullptr);
    ASSERT_NE(out, nullptr);
    ASSERT_EQ(ORLICFileLock(0x20006, 0), 0);
    XavoStandinFailCalls("*", 1, -1, 0x0500);
    EXPECT_EQ(ORLICPclose(out), -1);
    EXPECT_EQ(ORLICFileUnlock(0x20000), -1);
    pid_t pid = fork();
    ASSERT_GE(pid, 0);
    if (pid == 0) {
        XavoStandinReset();
        _exit(ORLICFileLock(0x20006, 0) == 0 ? 0 : 1);
    }
    int status = -1;
    ASSERT_EQ(waitpid(pid, &status, 0), pid);
    EXPECT_EQ(status, 0) << "the lock was let go";
    for (const auto &p : xavo::test::Descendants()) ADD_FAILURE() << "left: " << p.pid << " " << p.state;
}

}  // namespace
