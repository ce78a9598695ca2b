#include "status/report.h"

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

// Valid UTF-8 as it is; a control character, or a byte that is not part of
// valid UTF-8, as \xHH.
static std::string
printable(const std::string& text)
{
    std::string out;
    for (size_t i = 0; i < text.size();) {
        size_t n = utf8_length(text, i);
        if (n == 0 || static_cast<unsigned char>(text[i]) < 0x20 || text[i] == 0x7f)
            out += hex("\\x%02x", static_cast<unsigned char>(text[i])), n = 1;
        else
            out.append(text, i, n);
        i += n;
    }
    return out;
}

// A JSON string. A byte that is not part of valid UTF-8 becomes \udcHH,
// the surrogate escape: decoders that know it give the byte back.
static std::string
json(const std::string& text)
{
    std::string out = "\"";
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
    std::string out = "{\"root\":" + json(d.root) + ",\"version\":" + json(d.version) +
                      ",\"version_understood\":" + json(d.version_understood) +
                      ",\"icu_schema\":" + json(d.icu_schema);
    if (std::string(extra) == "live")
        out += ",\"compatible\":" + json(d.compatible) + ",\"older\":" + json(d.older);
    if (std::string(extra) == "latest")
        out += ",\"compatible\":" + json(d.compatible) + ",\"newer\":" + json(d.newer);
    return out + "}";
}

std::string
json_report(const velm_report& r)
{
    const auto& next = r.next_boot;
    std::string messages, findings;
    for (const std::string& message : next.messages)
        messages += (messages.empty() ? "" : ",") + json(message);
    for (const velm_finding& f : r.findings)
        findings += std::string(findings.empty() ? "" : ",") + "{\"id\":" + json(f.id) +
                    ",\"severity\":" + json(f.severity) + ",\"message\":" + json(f.message) +
                    ",\"repair\":" + json(f.repair) + "}";
    return "{\"zoneinfo\":" + json(r.zoneinfo) + ",\"icutz\":" + json(r.icutz) +
           ",\"localtime\":" + json(r.localtime) + ",\"tz_latest\":" + json(r.tz_latest) +
           ",\"record\":" + json(r.record) + ",\"localtime_zone\":" +
           json(r.localtime_zone.empty() ? velm_text() : r.localtime_zone) +
           ",\"live\":" + json(r.live, "live") + ",\"system\":" + json(r.system, "") +
           ",\"latest\":" + json(r.latest, "latest") + R"(,"next_boot":{"action":)" +
           json(next.action) + ",\"zoneinfo\":" + json(next.zoneinfo) +
           ",\"icutz\":" + json(next.icutz) + ",\"localtime\":" + json(next.localtime) +
           ",\"record\":" + json(next.record) +
           ",\"exit_status\":" + std::to_string(next.exit_status) + ",\"messages\":[" + messages +
           "]},\"findings\":[" + findings + "],\"health\":" + json(r.health) + "}\n";
}

static std::string
line(const std::string& label, const std::string& text)
{
    return "  " + label + std::string(label.size() < 11 ? 11 - label.size() : 1, ' ') +
           printable(text) + "\n";
}

static std::string
link(const velm_text& target)
{
    return target ? "-> " + *target : "(none)";
}

static std::string
dataset(const velm_dataset_facts& d)
{
    if (!d.present)
        return "(none understood)";
    return (d.root.empty() ? "system data " : "update ") + d.version +
           (d.version_understood ? "" : " (not a version)") + ", ICU schema " +
           (d.icu_schema.empty() ? "(none)" : d.icu_schema);
}

std::string
text_report(const velm_report& r)
{
    const auto& next = r.next_boot;
    std::string out = "now\n";
    out += line("in use", dataset(r.live));
    out += line("system", dataset(r.system));
    out += line("latest", r.latest.present
                              ? dataset(r.latest) +
                                    (r.latest.compatible ? ", compatible" : ", incompatible") +
                                    (r.latest.newer ? ", newer" : ", not newer")
                              : "(none understood)");
    out += line("zoneinfo", link(r.zoneinfo));
    out += line("icutz", link(r.icutz));
    out +=
        line("localtime", link(r.localtime) +
                              (r.localtime_zone.empty() ? "" : " (zone " + r.localtime_zone + ")"));
    out += line("tz_latest", link(r.tz_latest));
    out += line("record", r.record ? *r.record : "(none)");
    out += "next boot\n";
    out += line("does", next.action == "adopt"   ? "adopts " + r.latest.version
                        : next.action == "reset" ? "resets to the system data"
                        : next.action == "keep"  ? "keeps the data in use"
                                                 : "fails: not even the system data can be linked");
    out += line("zoneinfo", link(next.zoneinfo));
    out += line("icutz", link(next.icutz));
    out += line("localtime", link(next.localtime));
    out += line("record", next.record ? *next.record + " (written)" : "(left as it is)");
    for (const std::string& message : next.messages)
        out += line("says", message);
    if (next.exit_status != 0)
        out += line("exits", std::to_string(next.exit_status));
    out += r.findings.empty() ? "findings\n  (none)\n" : "findings\n";
    for (const velm_finding& f : r.findings)
        out += line(f.severity, f.id + ": " + f.message) + line("", "repair: " + f.repair);
    return out + "health: " + r.health + "\n";
}
