// Device ID strings: the key search with its getters, and the pair walk of
// the model detection.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include "support/logs.h"
#include "support/paths.h"
#include "support/sections.h"
#include "xavoprinter.h"

using ::testing::IsEmpty;
using namespace xavo::test;

namespace {

using Getter = int32_t (*)(char *, char *, int32_t);

// The key is found anywhere, case ignored, and its value copied to the
// buffer; a key that is not found is not an error.  Arguments are checked
// in order, each refusal logged with its condition.
TEST(DeviceIdSearch, FindsTheKeyAnywhereCopiesItsValueAndRefusesBadArgumentsInOrder) {
    struct {
        const char *szId, *szKey;
        bool bBuf;  // else no buffer
        int32_t cbBuf, result;
        const char *szValue;      // the buffer afterwards
        const char *szCondition;  // the refused argument's
    } cases[] = {
        {"MFG:X;MDL:Y;", "mdl:", true, 64, 0, "Y", nullptr},               // case ignored on both sides
        {"XMDL:inner;MDL:outer;", "MDL:", true, 64, 0, "inner", nullptr},  // found inside a longer key, or a value
        {"MFG:X;MDL:Last one", "MDL:", true, 64, 0, "Last one", nullptr},  // to the end of the text
        {"MDL:;MFG:X;", "MDL:", true, 64, 0, "", nullptr},
        {"MDL: Spaced ;", "MDL:", true, 64, 0, " Spaced ", nullptr},
        {"MDL:Printer;", "MDL:", true, 4, 0, "Pri", nullptr},
        {"MFG:X;", "MDL:", true, 64, -1, "untouched", nullptr},
        {nullptr, nullptr, false, 0, -1, "untouched", "((void *)0) != szStringId"},
        {"", "MDL:", true, 8, -1, "untouched", "0 != szStringId[0]"},
        {"MDL:X;", nullptr, true, 8, -1, "untouched", "((void *)0) != szType"},
        {"MDL:X;", "", true, 8, -1, "untouched", "0 != szType[0]"},
        {"MDL:X;", "MDL:", false, 8, -1, "untouched", "((void *)0) != szBuf"},
        {"MDL:X;", "MDL:", true, 0, -1, "untouched", "0 < cbBuf"},
    };
    for (const auto &c : cases) {
        const char *szRow = c.szCondition ? c.szCondition : c.szId;
        std::string id = c.szId ? c.szId : "";
        char szBuf[64] = "untouched";
        char *pId = c.szId ? id.data() : nullptr, *pBuf = c.bBuf ? szBuf : nullptr;
        ORLICErrSetEx(0, "test", 0);
        EXPECT_EQ(XAVOPrinterConfStringIdParse(pId, c.szKey, pBuf, c.cbBuf), c.result) << szRow;
        EXPECT_STREQ(szBuf, c.szValue) << szRow;
        EXPECT_EQ(c.szCondition ? ORLICErrGet() : 0u, c.szCondition ? ERR_BAD_PARAMETERS : 0u) << szRow;
        const std::string refused = std::string("3 printer_conf_string_id_parse:N Invaild Argument (") +
                                    (c.szCondition ? c.szCondition : "") + ")=[0]\n";
        EXPECT_EQ(Logs(), std::vector<std::string>(c.szCondition ? 1 : 0, refused)) << szRow;
    }
}

// Each getter tries its keys in order and answers the first one found, even
// behind the lesser ones; a bad string is logged once per key tried.
TEST(DeviceIdGetters, TakeTheFirstOfTheirKeysFound) {
    const std::pair<Getter, std::vector<std::string>> getters[] = {
        {XAVOPrinterConfStringIdGetVendor, {"MANUFACTURER", "MFG", "MFR"}},
        {XAVOPrinterConfStringIdGetModel, {"MODEL", "MDL", "DESCRIPTION", "DES"}},
        {XAVOPrinterConfStringIdGetCmd, {"COMMAND SET", "CMD"}},
    };
    for (const auto &[getter, keys] : getters) {
        char szBuf[8];
        for (size_t first = 0; first < keys.size(); ++first) {
            std::string id;
            for (size_t k = keys.size(); k-- > first;) id += keys[k] + ":" + std::to_string(k) + ";";
            EXPECT_EQ(getter(id.data(), szBuf, sizeof szBuf), 0) << id;
            EXPECT_EQ(szBuf, std::to_string(first)) << id;
        }
        std::string none = "XYZ:1;";
        EXPECT_EQ(getter(none.data(), szBuf, sizeof szBuf), -1) << keys[0];
        EXPECT_EQ(getter(nullptr, szBuf, sizeof szBuf), -1);
        EXPECT_EQ(Logs().size(), keys.size());
    }
}

// Brand and model that the pair walk finds in a stored device ID string,
// starting from "keep" in both; no other field of the record is written.
std::pair<std::string, std::string> Detect(const std::string &id) {
    ResetSandbox();
    WriteSection(kConf, "printer", {{"usblp string id", id}});
    UsbPrinterConf conf;
    std::memset(&conf, 'z', sizeof conf);
    std::strcpy(conf.szPrinterId, "printer");
    std::strcpy(conf.szBrand, "keep");
    std::strcpy(conf.szModel, "keep");
    UsbPrinterConf before = conf;
    EXPECT_EQ(XAVOPrinterModelDetect(&conf), 0) << id;
    std::memcpy(before.szBrand, conf.szBrand, sizeof conf.szBrand);
    std::memcpy(before.szModel, conf.szModel, sizeof conf.szModel);
    EXPECT_EQ(std::memcmp(&before, &conf, sizeof conf), 0) << "no other field written";
    return {conf.szBrand, conf.szModel};
}

// The first MFG/MANUFACTURER and MDL/MODEL pairs with a value give brand
// and model, cut to their fields; keys match exactly, values run to ';'.  A
// key is everything up to the next ":", so a ";" before it belongs to the
// key: "CLS;MDL" names no model, and the walk goes on after its value.
TEST(ModelDetect, TakesTheFirstPairOfEachItemWithKeysRunningToTheNextColon) {
    const std::string brand(300, 'b'), model(2000, 'm');  // longer than a pair's value may be
    const struct {
        std::string id, brand, model;
    } cases[] = {
        {"MFG:ACME;MDL:Model 100;CMD:PCL;MANUFACTURER:B;MODEL:Second;", "ACME", "Model 100"},
        {"MANUFACTURER:Long Form;MODEL:M 2", "Long Form", "M 2"},
        {"mfg:ACME; MDL:X;", "keep", "keep"},
        {"CMD:PCL:5e;MDL:Colon;", "keep", "Colon"},
        {":novalue;MDL:;MODEL:Later;MFG:M", "M", "Later"},
        {"garbage without pairs", "keep", "keep"},
        {"MFG:" + brand + ";MDL:" + model + ";", brand.substr(0, 127), model.substr(0, 127)},
        {"CLS;MDL:X;MFG:ACME;", "ACME", "keep"},
        {"CLS;MFG:X;MDL:Y;", "keep", "Y"},
        {";MDL:X;MODEL:Z;", "keep", "Z"},
        {"MDL;:X;MFG:A", "A", "keep"},
        {"MFG:A;B;MDL:C;MODEL:D;", "A", "D"},  // the value ends at its ";": "B;MDL" is the next key
        {"A;B;C;MFG:;MANUFACTURER:E;", "E", "keep"},
        {"CLS;MDL:X;", "keep", "keep"},
        {"X;Y;Z;", "keep", "keep"},
    };
    for (const auto &c : cases) EXPECT_EQ(Detect(c.id), std::make_pair(c.brand, c.model)) << c.id.substr(0, 80);
}

TEST(ModelDetect, MissingOrEmptyStringIdFailsWithErrExec) {
    WriteSection(kConf, "empty", {{"usblp string id", ""}});
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
