// SPDX-License-Identifier: Apache-2.0
#include "status/report.h"

#include "support/paths.h"

#include <algorithm>

// How many bytes from text[i] on form one valid UTF-8 character, or 0.
static size_t
utf8_length(const std::string& text, size_t i)
{
    auto byte = [&text](size_t at) { return static_cast<unsigned char>(text[at]); };
    unsigned char c = byte(i);
    size_t n = c < 0x80                ? 1
               : c >= 0xc2 && c < 0xe0 ? 2
               : c >= 0xe0 && c < 0xf0 ? 3
               : c >= 0xf0 && c < 0xf5 ? 4
                                       : 0;
    if (n == 0 || i + n > text.size())
        return 0;
    for (size_t k = 1; k < n; ++k) {
        if ((byte(i + k) & 0xc0) != 0x80)
            return 0;
    }
    // No overlong forms, no surrogates, nothing beyond U+10FFFF.
    unsigned char next = n > 1 ? byte(i + 1) : 0x80;
    bool bad = (c == 0xe0 && next < 0xa0) || (c == 0xed && next >= 0xa0) ||
               (c == 0xf0 && next < 0x90) || (c == 0xf4 && next >= 0x90);
    return bad ? 0 : n;
}

static std::string
hex(const char* form, unsigned char byte)
{
    char text[8];
    (void)snprintf(text, sizeof text, form, byte);
    return text;
}

// A text no longer than longest_text bytes, or its start with the cut
// marked; never cut inside a UTF-8 character.
static std::string
cut(const std::string& text)
{
    if (text.size() <= longest_text)
        return text;
    size_t end = longest_text;
    while (end > longest_text - 3 && (static_cast<unsigned char>(text[end]) & 0xc0) == 0x80)
        --end;
    return text.substr(0, end) + "[cut]";
}

// Whether the character at text[i], n bytes long, is a control character:
// C0 (and DEL) or C1 (U+0080 to U+009F, which terminals obey too).
static bool
control(const std::string& text, size_t i, size_t n)
{
    auto c = static_cast<unsigned char>(text[i]);
    return c < 0x20 || c == 0x7f ||
           (n == 2 && c == 0xc2 && static_cast<unsigned char>(text[i + 1]) < 0xa0);
}

// Valid UTF-8 as it is; a control character, or a byte that is not part of
// valid UTF-8, as \xHH, each of its bytes.
static std::string
printable(const std::string& whole)
{
    std::string text = cut(whole), out;
    for (size_t i = 0; i < text.size();) {
        size_t n = utf8_length(text, i);
        if (n == 0 || control(text, i, n)) {
            for (size_t k = 0; k < std::max(n, size_t(1)); ++k)
                out += hex("\\x%02x", static_cast<unsigned char>(text[i + k]));
            n = std::max(n, size_t(1));
        } else {
            out.append(text, i, n);
        }
        i += n;
    }
    return out;
}

// A JSON string. A byte that is not part of valid UTF-8 becomes \udcHH,
// the surrogate escape: decoders that know it give the byte back. A text
// longer than longest_text is cut, but for a command, which has to run.
static std::string
json(const std::string& whole, bool whole_text = false)
{
    std::string text = whole_text ? whole : cut(whole), out = "\"";
    for (size_t i = 0; i < text.size();) {
        size_t n = utf8_length(text, i);
        auto c = static_cast<unsigned char>(text[i]);
        if (n == 0)
            out += hex("\\udc%02x", c), n = 1;
        else if (c == '"' || c == '\\')
            out += std::string("\\") + text[i];
        else if (c < 0x20)
            out += hex("\\u%04x", c);
        else
            out.append(text, i, n);
        i += n;
    }
    return out + "\"";
}

static std::string
json(const velm_text& text)
{
    return text ? json(*text) : "null";
}

static std::string
json(bool value)
{
    return value ? "true" : "false";
}

static std::string
json(const velm_dataset_facts& d, const char* extra)
{
    if (!d.present)
        return "null";
    // The system partition's data has no root of its own: null, not "".
    std::string out = "{\"root\":" + json(d.root.empty() ? velm_text() : d.root) +
                      ",\"version\":" + json(d.version) +
                      ",\"version_understood\":" + json(d.version_understood) +
                      ",\"icu_schema\":" + json(d.icu_schema) +
                      ",\"unreadable\":" + json(d.unreadable);
    if (std::string(extra) == "live")
        out += ",\"compatible\":" + json(d.compatible) + ",\"older\":" + json(d.older);
    if (std::string(extra) == "latest")
        out += ",\"compatible\":" + json(d.compatible) + ",\"newer\":" + json(d.newer);
    return out + "}";
}

std::string
shown(const std::string& text)
{
    return printable(text);
}

std::string
json_text(const std::string& text)
{
    return json(text);
}

std::string
json_findings(const std::vector<velm_finding>& findings, const std::string& root)
{
    std::string out;
    for (const velm_finding& f : findings) {
        std::string commands;
        for (const velm_command& command : f.commands.value_or(velm_commands()))
            commands += (commands.empty() ? "" : ",") + json(shell_text(command, root), true);
        out += std::string(out.empty() ? "" : ",") + "{\"id\":" + json(f.id) +
               ",\"severity\":" + json(f.severity) + ",\"message\":" + json(f.message) +
               ",\"commands\":" + (f.commands ? "[" + commands + "]" : "null") +
               ",\"manual\":" + json(f.manual.empty() ? velm_text() : f.manual) +
               ",\"verified\":" + json(f.verified) + "}";
    }
    return "[" + out + "]";
}

std::string
json_run(const velm_run& next)
{
    std::string messages;
    for (const std::string& message : next.messages)
        messages += (messages.empty() ? "" : ",") + json(message);
    return "{\"action\":" + json(next.action) + ",\"zoneinfo\":" + json(next.zoneinfo) +
           ",\"icutz\":" + json(next.icutz) + ",\"localtime\":" + json(next.localtime) +
           ",\"record\":" + json(next.record) +
           ",\"exit_status\":" + std::to_string(next.exit_status) + ",\"messages\":[" + messages +
           "]}";
}

std::string
json_report(const velm_report& r)
{
    std::string remaining;
    for (const std::string& id : r.repaired_findings)
        remaining += (remaining.empty() ? "" : ",") + json(id);
    return "{\"format\":" + std::to_string(report_format) + ",\"zoneinfo\":" + json(r.zoneinfo) +
           ",\"icutz\":" + json(r.icutz) + ",\"localtime\":" + json(r.localtime) +
           ",\"tz_latest\":" + json(r.tz_latest) + ",\"record\":" + json(r.record) +
           ",\"localtime_zone\":" +
           json(r.localtime_zone.empty() ? velm_text() : r.localtime_zone) +
           ",\"live\":" + json(r.live, "live") + ",\"system\":" + json(r.system, "") +
           ",\"latest\":" + json(r.latest, "latest") + ",\"next_boot\":" + json_run(r.next_boot) +
           ",\"findings\":" + json_findings(r.findings, r.root) + ",\"health\":" + json(r.health) +
           R"(,"after_repair":{"health":)" + json(r.repaired_health) + ",\"findings\":[" +
           remaining + "]}}\n";
}

static std::string
link(const char* name, const velm_text& target)
{
    return "  " + std::string(name) + (target ? " -> " + printable(*target) : ": no link") + "\n";
}

static std::string
dataset(const velm_dataset_facts& d)
{
    return (d.root.empty() ? "the system data " : "update ") + printable(d.version) +
           (d.version_understood ? "" : " (not a version)") + ", ICU schema " +
           (d.icu_schema.empty() ? (d.unreadable ? "unknown" : "none") : printable(d.icu_schema)) +
           (d.unreadable ? " (some of its data cannot be read)" : "");
}

static const char*
what_it_does(const std::string& action)
{
    return action == "adopt"   ? "It adopts the update tz_latest names."
           : action == "reset" ? "It resets the device to the system data."
           : action == "keep"  ? "It keeps the data in use."
                               : "It fails: not even the system data can be linked.";
}

// How a finding is repaired, in one line or a line for each command.
static std::string
repair(const velm_finding& f, const std::string& root)
{
    if (!f.commands)
        return f.manual.empty() ? "Repair: none needed." : "Needs: " + printable(f.manual) + ".";
    if (f.commands->empty())
        return "Repair: nothing to run; the next boot does it.";
    std::string out = f.verified ? "Repair:" : "Repair (not shown to work):";
    for (const velm_command& command : *f.commands)
        out += "\n      " + printable(shell_text(command, root));
    return out;
}

std::string
text_run(const velm_run& next)
{
    std::string out = "  " + std::string(what_it_does(next.action)) + "\n" +
                      link("zoneinfo", next.zoneinfo) + link("icutz", next.icutz) +
                      link("localtime", next.localtime);
    out += next.record ? "  It records " + printable(*next.record) + ".\n"
                       : "  It leaves the record as it is.\n";
    for (const std::string& message : next.messages)
        out += "  It says: " + printable(message) + "\n";
    if (next.exit_status != 0)
        out += "  It exits with status " + std::to_string(next.exit_status) + ".\n";
    return out;
}

std::string
text_findings(const std::vector<velm_finding>& findings, const std::string& root)
{
    std::string out;
    for (const velm_finding& f : findings) {
        out += "  " + f.severity + " " + f.id + ": " + printable(f.message) + "\n";
        out += "    " + repair(f, root) + "\n";
    }
    return out;
}

std::string
text_report(const velm_report& r)
{
    std::string out =
        "Now\n  In use: " +
        (r.live.present ? dataset(r.live) : std::string("no data the boot tool understands")) +
        ".\n  System: " +
        (r.system_missing ? "none: " + std::string(velm_path::system_zoneinfo) + " is no directory"
         : r.system.present ? dataset(r.system)
                            : std::string("none that can be read")) +
        ".\n";
    if (r.latest.present)
        out += "  Latest: " + dataset(r.latest) + "; " +
               (r.latest.compatible ? "compatible with" : "incompatible with") +
               " the system data, " + (r.latest.newer ? "newer" : "not newer") +
               " than the data in use.\n";
    out += link("zoneinfo", r.zoneinfo) + link("icutz", r.icutz) + link("localtime", r.localtime) +
           link("tz_latest", r.tz_latest);
    if (!r.localtime_zone.empty())
        out += "  The zone is " + printable(r.localtime_zone) + ".\n";
    out += r.record_unreadable ? "  The record of the last adoption cannot be read.\n"
           : r.record ? "  The record of the last adoption reads " + printable(*r.record) + ".\n"
                      : "  There is no record of an adoption.\n";
    out += "Next boot\n" + text_run(r.next_boot);
    out += r.findings.empty() ? "Findings: none.\n" : "Findings\n";
    out += text_findings(r.findings, r.root);
    bool any = false;
    for (const velm_finding& f : r.findings)
        any = any || (f.commands && !f.commands->empty());
    out += "Health: " + r.health + ".\n";
    if (any)
        out += "After these repairs and one boot: " + r.repaired_health + ".\n";
    return out;
}

std::string
commands_report(const velm_report& r)
{
    std::string out;
    for (const velm_finding& f : r.findings) {
        // What the simulation did not show to work is shown, never run.
        for (const velm_command& command : f.commands.value_or(velm_commands()))
            out += (f.verified ? "" : "# not shown to work: ") + shell_text(command, r.root) + "\n";
    }
    return out;
}
