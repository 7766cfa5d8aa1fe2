// Network identification against the real peers of the sandbox's loopback
// network: ping, snmpd and avahi-daemon.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <future>
#include <memory>
#include <string>
#include <vector>

#include "sandbox/avahi.h"
#include "sandbox/sandbox.h"
#include "sandbox/snmpd.h"
#include "support/logs.h"
#include "xavoprinter.h"

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using namespace xavo::test;

namespace {

TEST(PingStatus, RealPingOnLoopbackAndWithoutRoute) {
    char szStatus[16];
    EXPECT_EQ(XAVOPrinterNetPingStatus("127.0.0.1", szStatus, 4), 0);
    EXPECT_STREQ(szStatus, "Onl") << "cut to the caller's size";
    // No interface but lo in the sandbox: no route, nothing is sent.
    EXPECT_EQ(XAVOPrinterNetPingStatus("10.255.255.1", szStatus, sizeof szStatus), 0);
    EXPECT_STREQ(szStatus, "Offline");
}

// ---- mDNS against the real avahi-daemon ----
// Three printers on loopback.  127.0.0.11 begins with 127.0.0.1 and
// announces the most preferred service: asking for 127.0.0.1 must not
// take it.  127.0.0.3 offers a web page and an LPD queue without TXT
// strings, whose resolved line ends in an empty field.
class AvahiDiscovery : public ::testing::Test {
protected:
    static void SetUpTestSuite() {
        avahi_ = std::make_unique<AvahiResponder>(std::vector<MdnsPrinter>{
            {"laser", "127.0.0.1", "Office Laser",
             {{"_ipp._tcp", 631, {"usb_MDL=Laser 100"}},
              {"_pdl-datastream._tcp", 9100, {"usb_CMD=PCL,PJL", "usb_MDL=Laser 100", "usb_MFG=ACME"}}}},
            {"inkjet", "127.0.0.11", "Lab Inkjet",
             {{"_printer._tcp", 515, {"usb_MFG=Canon", "usb_MDL=iX 6800"}},
              {"_canon-bjnp1._tcp", 8611, {"usb_CMD=BJL,BJRaster3", "usb_MFG=Canon"}}}},
            {"nas", "127.0.0.3", "Storage Box",
             {{"_http._tcp", 80, {"usb_MFG=Other", "usb_MDL=Web"}}, {"_printer._tcp", 515, {}}}},
        });
    }
    static void TearDownTestSuite() { avahi_.reset(); }
    static inline std::unique_ptr<AvahiResponder> avahi_;
};
XAVO_SANDBOX_PER_SUITE(AvahiDiscovery);

// The lookups run at the same time, as the appliance's processes may run
// them: each browse takes the daemon's second whatever it finds.
TEST_F(AvahiDiscovery, PreferredServiceOfTheWholeAddressCompletesTheRecord) {
    ASSERT_TRUE(avahi_->ready()) << AvahiResponder::DaemonLog();
    struct Case {
        const char *szName, *szIP, *szGivenId;
        int32_t result;
        const char *szBackend, *szBrand, *szModel, *szStringId;
    };
    const Case cases[] = {
        {"socket before ipp, not the longer address's bjnp", "127.0.0.1", "", 0, "socket", "ACME", "Laser 100",
         "MFG:ACME;CMD:PCL,PJL;MDL:Laser 100;CLS:PRINTER;DES:ACME Laser 100;"},
        {"a device ID already there is kept", "127.0.0.1", "MFG:Snmp;MDL:Given;", 0, "socket", "ACME",
         "Laser 100", "MFG:Snmp;MDL:Given;"},
        {"bjnp before lpd; no model in its TXT", "127.0.0.11", "", 0, "bjnp", "Not Found", "Not Found",
         "MFG:Not Found;CMD:BJL,BJRaster3;MDL:Not Found;CLS:PRINTER;DES:Not Found Not Found;"},
        {"a web page and an empty TXT are no service", "127.0.0.3", "", 1, "", "", "", ""},
    };
    struct Outcome { int32_t result; int savedErrno; NetPrinterInfo info; };
    std::vector<std::future<Outcome>> outcomes;
    for (const Case &c : cases) {
        outcomes.push_back(std::async(std::launch::async, [&c] {
            Outcome out{};
            std::strcpy(out.info.szQName, "queue");
            std::strcpy(out.info.szStringId, c.szGivenId);
            errno = EDOM;
            out.result = XAVOPrinterNetAvahiInfoGet(c.szIP, &out.info);
            out.savedErrno = errno;
            return out;
        }));
    }
    for (size_t i = 0; i < std::size(cases); ++i) {
        const Case &c = cases[i];
        Outcome out = outcomes[i].get();
        EXPECT_EQ(out.result, c.result) << c.szName;
        EXPECT_EQ(out.savedErrno, EDOM) << c.szName;
        EXPECT_STREQ(out.info.szBackend, c.szBackend) << c.szName;
        EXPECT_STREQ(out.info.szBrand, c.szBrand) << c.szName;
        EXPECT_STREQ(out.info.szModel, c.szModel) << c.szName;
        EXPECT_STREQ(out.info.szStringId, c.szStringId) << c.szName;
        EXPECT_STREQ(out.info.szQName, "queue") << c.szName;
        EXPECT_STREQ(out.info.szIP, "") << c.szName;
    }
    EXPECT_THAT(UnitLogs("printer_net_"),
                ElementsAre(AllOf(HasSubstr("printer_net_avahi_info_get:N Failed to make printer string ID. Info: "),
                                  HasSubstr("\"usb_CMD=BJL,BJRaster3\""), Not(HasSubstr("iX 6800")))));
}

// ---- SNMP against the real snmpd ----
const std::string kDeviceId = "MFG:ACME;CMD:PCL,PJL;MDL:LaserJet 100;CLS:PRINTER;DES:ACME LaserJet 100;";

class SnmpProbe : public ::testing::Test {
protected:
    static void SetUpTestSuite() {
        PlaceSnmpClientConfig();
        using Values = std::vector<SnmpValue>;
        agents_.push_back(std::make_unique<SnmpAgent>(
            "127.0.0.1", Values{{".1.1.0", "integer", "7"},
                                {".1.2.0", "octet_str", kDeviceId},
                                {".1.3.0", "octet_str", "LPR://127.0.0.1/lp1"},
                                {".1.4.0", "octet_str", "plain text"}}));
        agents_.push_back(std::make_unique<SnmpAgent>("127.0.0.2", Values{{".1.2.0", "octet_str", kDeviceId}}));
        agents_.push_back(
            std::make_unique<SnmpAgent>("127.0.0.3", Values{{".1.3.0", "octet_str", "socket://127.0.0.3:9100"}}));
    }
    static void TearDownTestSuite() { agents_.clear(); }
    static inline std::vector<std::unique_ptr<SnmpAgent>> agents_;
};
XAVO_SANDBOX_PER_SUITE(SnmpProbe);

TEST_F(SnmpProbe, AnswersOfRealAgents) {
    for (auto &agent : agents_) ASSERT_TRUE(agent->running());
    NetPrinterInfo info;
    std::memset(&info, 'x', sizeof info);
    EXPECT_EQ(XAVOPrinterNetInfoGetByIP("127.0.0.1", &info), 0);
    EXPECT_STREQ(info.szIP, "");
    EXPECT_STREQ(info.szBackend, "lpd");
    EXPECT_STREQ(info.szQName, "lp1");
    EXPECT_EQ(std::string(info.szStringId), kDeviceId);
    EXPECT_STREQ(info.szBrand, "ACME");
    EXPECT_STREQ(info.szModel, "LaserJet 100");

    EXPECT_EQ(XAVOPrinterNetInfoGetByIP("127.0.0.2", &info), 1) << "device ID without URI";
    EXPECT_STREQ(info.szBackend, "");
    EXPECT_STREQ(info.szModel, "LaserJet 100");

    EXPECT_EQ(XAVOPrinterNetInfoGetByIP("127.0.0.3", &info), -1) << "URI without device ID";
    EXPECT_STREQ(info.szBackend, "socket");
    EXPECT_STREQ(info.szQName, "");
    EXPECT_THAT(Logs(), ::testing::Contains(::testing::HasSubstr("Failed to get network printer string ID.")));

    EXPECT_EQ(XAVOPrinterNetInfoGetByIP("127.0.0.4", &info), 1) << "no agent: the tool's own time-out";
    EXPECT_THAT(Logs(), IsEmpty());
}

TEST_F(SnmpProbe, DeviceIdAtTheBufferBound) {
    std::string buf(kDeviceId.size() + 1, 'x');
    EXPECT_EQ(XAVOPrinterNetGetStringId("127.0.0.2", buf.data(), static_cast<int32_t>(kDeviceId.size() + 1)), 0);
    EXPECT_EQ(std::string(buf.c_str()), kDeviceId);
    EXPECT_EQ(XAVOPrinterNetGetStringId("127.0.0.2", buf.data(), static_cast<int32_t>(kDeviceId.size())), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_DATA);
    EXPECT_STREQ(buf.c_str(), "");
}

}  // namespace
