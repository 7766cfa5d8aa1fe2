// A real net-snmp agent (Debian's snmpd) answering as a network printer on
// one loopback address of the sandbox's private network, port 161, and the
// client configuration the real snmpwalk needs there: a MIB directory with
// the few definitions that name "enterprises", and a short time-out so
// that an address where no agent answers costs one second per walk.
//
// One agent per address, each stopped by its own pid.  Every value is
// published with snmpd's "override" directive under a private enterprise
// number, and the agent's view is cut down to that subtree so that a walk
// of "enterprises" shows only the printer's values.
#pragma once

#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "sandbox/daemon.h"
#include "sandbox/sandbox.h"

namespace xavo::test {

inline constexpr char kSnmpEnterprise[] = ".1.3.6.1.4.1.99999";

// One published value: its OID below the enterprise, an snmpd type
// ("octet_str", "integer") and the value as snmpd.conf takes it (text, or
// "0x" followed by hex digits).
struct SnmpValue {
    std::string suffix;  // ".1.1.0"
    std::string type;
    std::string value;
};

// The client side, written once per sandbox.
inline void PlaceSnmpClientConfig() {
    PlaceFile("/usr/share/snmp/mibs/SNMPv2-SMI.txt",
              "SNMPv2-SMI DEFINITIONS ::= BEGIN\n"
              "org            OBJECT IDENTIFIER ::= { iso 3 }\n"
              "dod            OBJECT IDENTIFIER ::= { org 6 }\n"
              "internet       OBJECT IDENTIFIER ::= { dod 1 }\n"
              "private        OBJECT IDENTIFIER ::= { internet 4 }\n"
              "enterprises    OBJECT IDENTIFIER ::= { private 1 }\n"
              "END\n");
    PlaceFile("/etc/snmp/snmp.conf",
              "mibdirs /usr/share/snmp/mibs\n"
              "mibs SNMPv2-SMI\n"
              "timeout 1\n"
              "retries 0\n");
}

class SnmpAgent {
public:
    SnmpAgent(const std::string &address, const std::vector<SnmpValue> &values) {
        std::string dir = "/tmp/snmpd-" + address;
        std::string conf = std::string("view printer included ") + kSnmpEnterprise + "\n" +
                           "rocommunity public default -V printer\n";
        for (const SnmpValue &v : values) {
            // "0x" and hex digits: any bytes, line breaks included, which a
            // quoted value of snmpd.conf cannot carry.
            const std::string value = v.value.starts_with("0x") ? v.value : "\"" + v.value + "\"";
            conf += "override " + std::string(kSnmpEnterprise) + v.suffix + " " + v.type + " " + value + "\n";
        }
        PlaceFile(dir + "/snmpd.conf", conf);
        std::string confPath = dir + "/snmpd.conf";
        std::string pidPath = dir + "/snmpd.pid";
        std::string listen = "udp:" + address + ":161";
        pid_ = StartDaemon({"/usr/sbin/snmpd", "-f", "-Ln", "-C", "-c", confPath, "-p", pidPath, listen},
                           dir + "/snmpd.log", {"SNMP_PERSISTENT_DIR=" + dir});
        // snmpd writes its pid file once its transports are open.
        for (int i = 0; i < 100 && pid_ > 0 && !FileExists(pidPath); ++i) {
            std::this_thread::sleep_for(std::chrono::milliseconds(50));
        }
    }
    SnmpAgent(const SnmpAgent &) = delete;
    SnmpAgent &operator=(const SnmpAgent &) = delete;
    ~SnmpAgent() { StopDaemon(pid_); }
    bool running() const { return pid_ > 0 && ::kill(pid_, 0) == 0; }

private:
    pid_t pid_ = -1;
};

}  // namespace xavo::test
