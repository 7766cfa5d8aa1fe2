// Network identification: the one-line readers of each tool's output from
// tables of lines the real tools printed, then the operations against fake
// tools for what no real peer prints (hostile output, interrupted reads).
// The real peers are net_peers_test's.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <string>

#include "sandbox/sandbox.h"
#include "support/logs.h"
#include "support/processes.h"
#include "xavoprinter.h"

// The readers are internal to the library: compiled into this suite.
#include "net/avahi_lines.cc"
#include "net/bjnp_lines.cc"
#include "net/ping_lines.cc"
#include "net/snmp_lines.cc"

using ::testing::ElementsAre;
using namespace xavo;
using namespace xavo::test;

namespace {

// ---- snmpwalk lines (recorded from snmpwalk 5.9.3 against snmpd) ----
struct SnmpIdCase { const char *szLine; SnmpIdKind kind; const char *szValue; };
const SnmpIdCase kSnmpIdCases[] = {
    {"SNMPv2-SMI::enterprises.99999.1.1.0 = STRING: \"MFG:ACME;CMD:PCL,PJL;MDL:LaserJet 100;CLS:PRINTER;\"",
     SnmpIdKind::kValue, "MFG:ACME;CMD:PCL,PJL;MDL:LaserJet 100;CLS:PRINTER;"},
    {"x = STRING: \"MODEL:X;MANUFACTURER:Y;\"", SnmpIdKind::kValue, "MODEL:X;MANUFACTURER:Y;"},
    {"x = \"MFG:ACME;MDL:LX;\"", SnmpIdKind::kNone, ""},
    {"x = STRING: \"mfg:acme;mdl:lx;\"", SnmpIdKind::kNone, ""},
    {"x = STRING: \"MFG:ACME;CMD:PCL;\"", SnmpIdKind::kNone, ""},
    {"x = STRING: \"MFG:ACME;MDL:cut short", SnmpIdKind::kValue, "MFG:ACME;MDL:cut shor"},
    {"MFG: MDL: STRING: \"", SnmpIdKind::kCutShort, ""},
    {"End of MIB", SnmpIdKind::kNone, ""},
};

struct SnmpUriCase {
    const char *szLine; SnmpUriKind kind; const char *szText; SnmpBackend backend; const char *szRest;
};
const SnmpUriCase kSnmpUriCases[] = {
    {"x = STRING: \"LPR://h/lp1\"", SnmpUriKind::kUri, "LPR://h/lp1", SnmpBackend::kLpd, "//h/lp1"},
    {"x = STRING: \"lpd://h/q\"", SnmpUriKind::kUri, "lpd://h/q", SnmpBackend::kLpd, "//h/q"},
    {"x = STRING: \"IPP://h/q\"", SnmpUriKind::kUri, "IPP://h/q", SnmpBackend::kScheme, "//h/q"},
    {"x = STRING: \"ipps://h/q\"", SnmpUriKind::kUri, "ipps://h/q", SnmpBackend::kUnmapped, "//h/q"},
    {"x = STRING: \"http://h/\"", SnmpUriKind::kPass, "", SnmpBackend::kUnmapped, ""},
    {"x = Hex-STRING: 68 74 74 70 3A 2F 2F", SnmpUriKind::kPass, "", SnmpBackend::kUnmapped, ""},
    {"x = STRING: ipp://no-quote", SnmpUriKind::kBad, "", SnmpBackend::kUnmapped, ""},
    {"ipp://h = STRING: \"x", SnmpUriKind::kBad, "", SnmpBackend::kUnmapped, ""},
};

TEST(SnmpLines, DeviceIdsNeedBothKeysAndTheMarkerUrisMapToBackends) {
    for (const SnmpIdCase &c : kSnmpIdCases) {
        SnmpDeviceId id = SnmpDeviceIdFromLine(c.szLine);
        EXPECT_EQ(id.kind, c.kind) << c.szLine;
        EXPECT_EQ(std::string(id.value), c.szValue) << c.szLine;
    }
    for (const SnmpUriCase &c : kSnmpUriCases) {
        SnmpUri uri = SnmpUriFromLine(c.szLine);
        EXPECT_EQ(uri.kind, c.kind) << c.szLine;
        EXPECT_EQ(std::string(uri.text), c.szText) << c.szLine;
        if (uri.kind != SnmpUriKind::kUri) continue;
        SnmpUriParts parts = SnmpSplitUri(uri.text);
        EXPECT_EQ(parts.backend, c.backend) << c.szLine;
        EXPECT_EQ(std::string(parts.rest), c.szRest) << c.szLine;
    }
    EXPECT_EQ(SnmpSplitUri("ipp").backend, SnmpBackend::kUnmapped) << "a bare scheme names no printer";
}

// ---- ping summaries (iputils) ----
TEST(PingLines, LossOtherThanTotalIsReachable) {
    struct {
        const char *szLine;
        std::optional<bool> reachable;
    } const cases[] = {
        {"2 packets transmitted, 1 received, 50% packet loss, time 1001ms", true},
        {"2 packets transmitted, 0 received, +2 errors, 100% packet loss, time 1002ms", false},
        {"1 packets transmitted, 0% packet loss", false},  // the loss is not before the second comma
        {"PING 127.0.0.1 (127.0.0.1) 56(84) bytes of data.", std::nullopt},
    };
    for (const auto &c : cases) EXPECT_EQ(PingSummaryReachable(c.szLine), c.reachable) << c.szLine;
}

// ---- avahi-browse TXT strings (the services' ports: the real daemon below) ----
TEST(AvahiLines, TxtValuesAreFoundByKeyAndMayBeCutShort) {
    const std::string txt = "\"usb_CMD=PCL,PJL\" \"usb_MDL=Laser 100\" \"usb_MFG=ACME\"";
    EXPECT_EQ(AvahiTxtValue(txt, "usb_MDL="), "Laser 100");
    EXPECT_EQ(AvahiTxtValue(txt, "usb_DES="), std::nullopt);
    EXPECT_EQ(AvahiTxtValue("\"usb_MFG=Cut sho", "usb_MFG="), "Cut sho");
}

std::string Listing(const std::string &body) { return "#!/bin/sh\ncat <<'EOF'\n" + body + "EOF\n"; }

constexpr char kBjnp[] = "/usr/lib/cups/backend/bjnp";
constexpr char kBjnpLine[] =
    "network bjnp://10.0.0.1:8611 \"Canon MX920 series\" \"Canon MX920 series 10.0.0.1\" "
    "\"MFG:Canon;CMD:BJL,BJRaster3;MDL:MX920 series;CLS:PRINTER;\"\n";

// Each kind of listing line through the operation (format of the CUPS bjnp
// backend 2.0.3); an empty listing means no backend at all.  The caller's
// queue name and errno stay whatever the answer.
TEST(BjnpDiscovery, ListingLinesDecideTheRecordTheAnswerAndTheRetries) {
    const std::vector<std::uint64_t> kNone, kThreeSeconds(3, 1000000u);
    struct Record {
        const char *szBackend = "", *szBrand = "", *szModel = "", *szStringId = "";
    };
    struct {
        const char *szName;
        std::string listing;
        int32_t result;
        const std::vector<std::uint64_t> &sleeps;
        size_t logs;  // a line per attempt that found the printer without a manufacturer
        Record record = {};
    } const cases[] = {
        {"the address line", kBjnpLine, 0, kNone, 0,
         {"bjnp", "Canon", "MX920 series", "MFG:Canon;CMD:BJL,BJRaster3;MDL:MX920 series;CLS:PRINTER"}},
        {"unknown first", std::string("network bjnp \"Unknown\" \"Canon network printer\"\n") + kBjnpLine, 1, kNone, 0},
        {"addresses that only begin or end alike",
         "network bjnp://10.0.0.11:8611 \"x\" \"x\" \"MFG:C;MDL:D;\"\n"
         "network bjnp://110.0.0.1:8611 \"x\" \"x\" \"MFG:C;MDL:D;\"\n", 1, kNone, 0},
        {"unidentified", "network bjnp://10.0.0.1:8611 \"Unidentified printer\" \"x\" \"\"\n", -1, kThreeSeconds, 0},
        {"no manufacturer", "network bjnp://10.0.0.1:8611 \"C\" \"C\" \"MDL:D;\"\n", -1, kThreeSeconds, 3},
        {"backend cannot start: no wait", "", -1, kNone, 0},
    };
    for (const auto &c : cases) {
        if (c.listing.empty()) {
            std::remove(kBjnp);
        } else {
            PlaceProgram(kBjnp, Listing(c.listing));
        }
        NetPrinterInfo info{};
        std::strcpy(info.szQName, "kept");
        errno = EAGAIN;
        EXPECT_EQ(XAVOPrinterNetBjnpInfoGet("10.0.0.1", &info), c.result) << c.szName;
        EXPECT_EQ(errno, EAGAIN) << c.szName;
        if (c.result == -1) { EXPECT_EQ(ORLICErrGet(), ERR_EXEC) << c.szName; }
        EXPECT_STREQ(info.szBackend, c.record.szBackend) << c.szName;
        EXPECT_STREQ(info.szBrand, c.record.szBrand) << c.szName;
        EXPECT_STREQ(info.szModel, c.record.szModel) << c.szName;
        EXPECT_STREQ(info.szStringId, c.record.szStringId) << c.szName;
        EXPECT_STREQ(info.szQName, "kept") << c.szName;
        EXPECT_EQ(TakeSleeps(), c.sleeps) << c.szName;
        EXPECT_EQ(UnitLogs("printer_net_").size(), c.logs) << c.szName;
    }
}

constexpr char kPing[] = "/bin/ping";

// Where no daemon of the suite runs, the library starts the appliance's
// one, which would detach out of the test's reach: a stub stands in.
constexpr char kAvahiDaemon[] = "/usr/sbin/avahi-daemon";
constexpr char kAvahiDaemonStub[] = "#!/bin/sh\ntouch /tmp/avahi-started\n";

TEST(HostileOutput, LongLinesNulBytesAndFloodsStayInsideTheBuffers) {
    // A 5000-byte line without quotes, NUL bytes, then 20000 lines.
    PlaceProgram(kPing,
                 "#!/bin/sh\nhead -c 5000 /dev/zero | tr '\\0' 'x'\nprintf 'a\\0b packet loss\\n'\n"
                 "i=0; while [ $i -lt 20000 ]; do echo \"line $i\"; i=$((i+1)); done\n");
    char szStatus[16];
    EXPECT_EQ(XAVOPrinterNetPingStatus("10.0.0.1", szStatus, sizeof szStatus), 0);
    EXPECT_STREQ(szStatus, "Offline");

    // The browser answers only once the daemon was started for it.  The
    // preferred service printed first must not be replaced by a later,
    // lesser one (the real daemon's print order cannot be chosen).
    PlaceProgram(kAvahiDaemon, kAvahiDaemonStub);
    struct { const char *szLines, *szBackend, *szBrand; } const browsers[] = {
        {"printf '=;lo;IPv4;P;T;local;h;10.0.0.1;9100;\"usb_MFG='\nhead -c 3000 /dev/zero | tr '\\0' 'M'\necho\n",
         "socket", "Not Found"},
        {"echo '=;lo;IPv4;P;_canon-bjnp1._tcp;local;h;10.0.0.1;8611;\"usb_MFG=A\" \"usb_MDL=B\"'\n"
         "echo '=;lo;IPv4;P;_ipp._tcp;local;h;10.0.0.1;631;\"usb_MFG=I\"'\n",
         "bjnp", "A"},
    };
    for (const auto &b : browsers) {
        PlaceProgram("/usr/xavo/sbin/avahi-browse",
                     std::string("#!/bin/sh\n[ -e /tmp/avahi-started ] || exit 0\n") + b.szLines);
        NetPrinterInfo info{};
        EXPECT_EQ(XAVOPrinterNetAvahiInfoGet("10.0.0.1", &info), 0) << b.szLines;
        EXPECT_STREQ(info.szBackend, b.szBackend);
        EXPECT_STREQ(info.szBrand, b.szBrand);
    }
    std::remove("/usr/xavo/sbin/avahi-browse");
    NetPrinterInfo info{};
    Logs();
    EXPECT_EQ(XAVOPrinterNetAvahiInfoGet("10.0.0.1", &info), -1) << "no browser: cannot start";
    EXPECT_THAT(UnitLogs("printer_net_"), ::testing::SizeIs(1));
}

// ---- interrupted reads: a repeating SIGALRM without SA_RESTART ----
class InterruptedReads : public ::testing::Test {
protected:
    static void StartTimer(long usInterval) {
        itimerval timer{{0, usInterval}, {0, usInterval}};
        setitimer(ITIMER_REAL, &timer, nullptr);
    }
    void TearDown() override {
        itimerval off{};
        setitimer(ITIMER_REAL, &off, nullptr);
    }
    InterruptingSignal alarm_{SIGALRM};
};

TEST_F(InterruptedReads, FewAreSurvivedTheTenthEndsTheCall) {
    PlaceProgram(kPing, "#!/bin/sh\nsleep 0.3\necho '1 packets transmitted, 1 received, 0% packet loss, time 0ms'\n");
    StartTimer(100000);  // about 3 interruptions before the line
    char szStatus[16];
    EXPECT_EQ(XAVOPrinterNetPingStatus("10.0.0.1", szStatus, sizeof szStatus), 0);
    EXPECT_STREQ(szStatus, "Online");

    PlaceProgram(kPing, "#!/bin/sh\nsleep 2\necho '1 packets transmitted, 1 received, 0% packet loss'\n");
    StartTimer(20000);  // far more than ten before the line
    errno = ERANGE;
    EXPECT_EQ(XAVOPrinterNetPingStatus("10.0.0.1", szStatus, sizeof szStatus), -1);
    EXPECT_EQ(errno, ERANGE);
    EXPECT_STREQ(szStatus, "Offline");

    PlaceProgram("/usr/bin/snmpwalk", "#!/bin/sh\nsleep 2\necho 'x = STRING: \"MFG:A;MDL:B;\"'\n");
    char szId[64];
    errno = ENOTTY;
    EXPECT_EQ(XAVOPrinterNetGetStringId("10.0.0.1", szId, sizeof szId), -1);
    EXPECT_EQ(errno, ENOTTY);

    PlaceProgram(kBjnp, "#!/bin/sh\nsleep 0.5\n" + std::string("echo '") + kBjnpLine + "'\n");
    NetPrinterInfo info{};
    EXPECT_EQ(XAVOPrinterNetBjnpInfoGet("10.0.0.1", &info), -1) << "each listing is spoilt by a signal";
    EXPECT_THAT(TakeSleeps(), ElementsAre(1000000u, 1000000u, 1000000u));
    UnitLogs("printer_net_");
}

// Both lookups over the same fake walk output.
TEST(SnmpToolOutput, ThreeWayAnswersOfBothLookups) {
    struct {
        const char *szName;
        std::string output;
        int32_t idResult, backendResult;
        const char *szBackend;
    } const cases[] = {
        {"URI line without a quote ends the lookup",
         "x = STRING: ipp://h/q\ny = STRING: \"ipp://h/q\"\n", -1, -1, ""},
        {"unmapped scheme", "x = STRING: \"ipps://h/q\"\n", -1, -1, ""},
        {"marker missing, next line taken",
         "MFG:A;MODEL:B;\nx = STRING: \"MFG:A;MDL:B;\"\ny = STRING: \"bjnp://h\"\n", 0, 0, "bjnp"},
    };
    for (const auto &c : cases) {
        PlaceProgram("/usr/bin/snmpwalk", Listing(c.output));
        char szId[64] = "x", szBackend[16] = "", szQName[16] = "";
        EXPECT_EQ(XAVOPrinterNetGetStringId("10.0.0.1", szId, sizeof szId), c.idResult) << c.szName;
        EXPECT_EQ(XAVOPrinterNetGetStringBackend("10.0.0.1", szBackend, 16, szQName, 16), c.backendResult) << c.szName;
        EXPECT_STREQ(szBackend, c.szBackend) << c.szName;
        if (c.idResult != 0) { EXPECT_STREQ(szId, "") << c.szName; }
    }
    UnitLogs("printer_net_");
}

}  // namespace
