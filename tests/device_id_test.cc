// Device ID strings: the key search with its getters, and the pair walk of
// the model detection.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "support/cases.h"
#include "support/logs.h"
#include "support/sections.h"
#include "xavoprinter.h"

using ::testing::IsEmpty;
using xavo::test::Logs;

namespace {

using Getter = int32_t (*)(char *, char *, int32_t);

struct SearchCase {
    const char *szName;
    Getter getter;    // nullptr: XAVOPrinterConfStringIdParse with szKey
    const char *szKey;
    const char *szId;
    int32_t cbBuf;
    int32_t result;
    const char *szValue;  // expected buffer afterwards
};

int32_t Search(const SearchCase &c, char *szBuf) {
    std::string id(c.szId);
    return c.getter ? c.getter(id.data(), szBuf, c.cbBuf)
                    : XAVOPrinterConfStringIdParse(id.data(), c.szKey, szBuf, c.cbBuf);
}

const SearchCase kSearchCases[] = {
    {"case ignored on both sides", nullptr, "mdl:", "MFG:X;MDL:Y;", 64, 0, "Y"},
    {"found inside a longer key", nullptr, "MDL:", "XMDL:inner;MDL:outer;", 64, 0, "inner"},  // or a value
    {"value to the end of the text", nullptr, "MDL:", "MFG:X;MDL:Last one", 64, 0, "Last one"},
    {"empty value", nullptr, "MDL:", "MDL:;MFG:X;", 64, 0, ""},
    {"blanks kept", nullptr, "MDL:", "MDL: Spaced ;", 64, 0, " Spaced "},
    {"cut to the buffer", nullptr, "MDL:", "MDL:Printer;", 4, 0, "Pri"},
    {"absent key leaves the buffer", nullptr, "MDL:", "MFG:X;", 64, -1, "untouched"},
    {"model keys in their order", XAVOPrinterConfStringIdGetModel, nullptr, "MDL:A;DES:B;MODEL:M;", 64, 0, "M"},
    {"MDL before DES", XAVOPrinterConfStringIdGetModel, nullptr, "DES:B;MDL:A;", 64, 0, "A"},
    {"DES as last resort", XAVOPrinterConfStringIdGetModel, nullptr, "DES:B;", 64, 0, "B"},
    {"DESCRIPTION before DES", XAVOPrinterConfStringIdGetModel, nullptr, "DES:B;DESCRIPTION:C;", 64, 0, "C"},
    {"MANUFACTURER wins over MFG", XAVOPrinterConfStringIdGetVendor, nullptr, "MFG:A;MANUFACTURER:B;", 64, 0, "B"},
    {"MFR last", XAVOPrinterConfStringIdGetVendor, nullptr, "MFR:R;", 64, 0, "R"},
    {"no vendor", XAVOPrinterConfStringIdGetVendor, nullptr, "MDL:X;", 64, -1, "untouched"},
    {"command set", XAVOPrinterConfStringIdGetCmd, nullptr, "CMD:PCL;COMMAND SET:PJL,PS;", 64, 0, "PJL,PS"},
    {"short command key", XAVOPrinterConfStringIdGetCmd, nullptr, "MFG:X;CMD:ESC/P;", 64, 0, "ESC/P"},
};

class DeviceIdSearch : public ::testing::TestWithParam<SearchCase> {};

TEST_P(DeviceIdSearch, AnswersAndFillsTheBuffer) {
    const SearchCase &c = GetParam();
    char szBuf[64] = "untouched";
    EXPECT_EQ(Search(c, szBuf), c.result);
    EXPECT_STREQ(szBuf, c.szValue);
    EXPECT_THAT(Logs(), IsEmpty()) << "a key that is not found is not an error";
}

INSTANTIATE_TEST_SUITE_P(Table, DeviceIdSearch, ::testing::ValuesIn(kSearchCases), xavo::test::CaseName());

TEST(DeviceIdSearch, ArgumentsAreCheckedInOrderAndLogged) {
    char szId[] = "MDL:X;";
    char szEmpty[] = "";
    char szBuf[8];
    struct {
        char *id;
        const char *key;
        char *buf;
        int32_t cb;
        const char *condition;
    } cases[] = {
        {nullptr, nullptr, nullptr, 0, "((void *)0) != szStringId"},
        {szEmpty, "MDL:", szBuf, 8, "0 != szStringId[0]"},
        {szId, nullptr, szBuf, 8, "((void *)0) != szType"},
        {szId, "", szBuf, 8, "0 != szType[0]"},
        {szId, "MDL:", nullptr, 8, "((void *)0) != szBuf"},
        {szId, "MDL:", szBuf, 0, "0 < cbBuf"},
    };
    for (const auto &c : cases) {
        ORLICErrSetEx(0, "test", 0);
        EXPECT_EQ(XAVOPrinterConfStringIdParse(c.id, c.key, c.buf, c.cb), -1);
        EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
        EXPECT_THAT(Logs(), ::testing::ElementsAre(std::string("3 printer_conf_string_id_parse:N Invaild Argument (") +
                                                   c.condition + ")=[0]\n"));
    }
}

TEST(DeviceIdSearch, GetterReportsABadArgumentOncePerKeyTried) {
    char szBuf[8];
    struct {
        Getter getter;
        size_t keys;
    } getters[] = {{XAVOPrinterConfStringIdGetVendor, 3},
                   {XAVOPrinterConfStringIdGetModel, 4},
                   {XAVOPrinterConfStringIdGetCmd, 2}};
    for (const auto &g : getters) {
        EXPECT_EQ(g.getter(nullptr, szBuf, sizeof szBuf), -1);
        EXPECT_EQ(Logs().size(), g.keys);
    }
}

// ---- the pair walk ----

constexpr char kConf[] = "/usr/xavo/etc/printer.conf";

void StoreStringId(const char *szPrinterId, const char *szStringId) {
    xavo::test::WriteSection(kConf, szPrinterId, {{"usblp string id", szStringId}});
}

struct WalkCase {
    const char *szId;
    const char *szBrand;
    const char *szModel;
};

class ModelDetect : public ::testing::TestWithParam<WalkCase> {};

TEST_P(ModelDetect, TakesTheFirstPairOfEachItemExactly) {
    const WalkCase &c = GetParam();
    StoreStringId("printer", c.szId);
    UsbPrinterConf conf;
    std::memset(&conf, 'z', sizeof conf);
    std::strcpy(conf.szPrinterId, "printer");
    std::strcpy(conf.szBrand, "keep");
    std::strcpy(conf.szModel, "keep");
    UsbPrinterConf before = conf;
    ASSERT_EQ(XAVOPrinterModelDetect(&conf), 0);
    EXPECT_STREQ(conf.szBrand, c.szBrand);
    EXPECT_STREQ(conf.szModel, c.szModel);
    // No other field is written.
    std::memcpy(before.szBrand, conf.szBrand, sizeof conf.szBrand);
    std::memcpy(before.szModel, conf.szModel, sizeof conf.szModel);
    EXPECT_EQ(std::memcmp(&before, &conf, sizeof conf), 0);
}

INSTANTIATE_TEST_SUITE_P(
    Table, ModelDetect,
    ::testing::Values(WalkCase{"MFG:ACME;MDL:Model 100;CMD:PCL;", "ACME", "Model 100"},
                      WalkCase{"MFG:A;MANUFACTURER:B;", "A", "keep"},
                      WalkCase{"MDL:First;MODEL:Second;MFG:ACME;", "ACME", "First"},
                      WalkCase{"MANUFACTURER:Long Form;MODEL:M 2", "Long Form", "M 2"},
                      WalkCase{"mfg:ACME;mdl:X;", "keep", "keep"},
                      WalkCase{"MFG:ACME; MDL:X;", "ACME", "keep"},
                      WalkCase{"CMD:PCL:5e;MDL:Colon;", "keep", "Colon"},
                      WalkCase{":novalue;MDL:;MODEL:Later;MFG:M", "M", "Later"},
                      WalkCase{"garbage without pairs", "keep", "keep"}));

TEST(ModelDetect, LongValuesAreCutToTheRecordFields) {
    const std::string brand(300, 'b');
    const std::string model(2000, 'm');  // longer than a pair's value may be
    StoreStringId("long", ("MFG:" + brand + ";MDL:" + model + ";").c_str());
    UsbPrinterConf conf{};
    std::strcpy(conf.szPrinterId, "long");
    ASSERT_EQ(XAVOPrinterModelDetect(&conf), 0);
    EXPECT_EQ(std::string(conf.szBrand), brand.substr(0, 127));
    EXPECT_EQ(std::string(conf.szModel), model.substr(0, 127));
}

TEST(ModelDetect, MissingOrEmptyStringIdFailsWithErrExec) {
    StoreStringId("empty", "");
    for (const char *id : {"empty", "unknown"}) {
        UsbPrinterConf conf{};
        std::strcpy(conf.szPrinterId, id);
        std::strcpy(conf.szBrand, "keep");
        EXPECT_EQ(XAVOPrinterModelDetect(&conf), -1);
        EXPECT_EQ(ORLICErrGet(), ERR_EXEC);
        EXPECT_STREQ(conf.szBrand, "keep");
    }
    EXPECT_EQ(XAVOPrinterModelDetect(nullptr), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    EXPECT_THAT(Logs(), IsEmpty());
}

}  // namespace
