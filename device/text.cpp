// SPDX-License-Identifier: Apache-2.0
#include "device/text.h"

std::string
json_run(const velm_run& next)
{
    std::string messages;
    for (const std::string& message : next.messages)
        messages += (messages.empty() ? "" : ",") + json_text(message);
    return "{\"action\":" + json_text(next.action) + ",\"zoneinfo\":" + json_text(next.zoneinfo) +
           ",\"icutz\":" + json_text(next.icutz) + ",\"localtime\":" + json_text(next.localtime) +
           ",\"record\":" + json_text(next.record) +
           ",\"exit_status\":" + std::to_string(next.exit_status) + ",\"messages\":[" + messages +
           "]}";
}

std::string
text_link(const char* name, const velm_text& target)
{
    return "  " + std::string(name) + (target ? " -> " + shown(*target) : ": no link") + "\n";
}

static const char*
what_it_does(const std::string& action)
{
    return action == "adopt"   ? "It adopts the update tz_latest names."
           : action == "reset" ? "It resets the device to the system data."
           : action == "keep"  ? "It keeps the data in use."
                               : "It fails: not even the system data can be linked.";
}

std::string
text_run(const velm_run& next)
{
    std::string out = "  " + std::string(what_it_does(next.action)) + "\n" +
                      text_link("zoneinfo", next.zoneinfo) + text_link("icutz", next.icutz) +
                      text_link("localtime", next.localtime);
    out += next.record ? "  It records " + shown(*next.record) + ".\n"
                       : "  It leaves the record as it is.\n";
    for (const std::string& message : next.messages)
        out += "  It says: " + shown(message) + "\n";
    if (next.exit_status != 0)
        out += "  It exits with status " + std::to_string(next.exit_status) + ".\n";
    return out;
}
