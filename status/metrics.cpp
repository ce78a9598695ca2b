// SPDX-License-Identifier: Apache-2.0
// The report as metrics in Prometheus's text exposition format, for
// node_exporter's textfile collector: a fleet asks of all its devices at
// once what tzlinks-status says of one.
#include "status/report.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <err.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

// A label value: quote, backslash and line end escaped, and, since values
// must be UTF-8, every byte that is not part of valid UTF-8 (or a control
// character) written as \xHH; cut past 8 KiB like every text shown.
static std::string
label(const std::string& value)
{
    std::string printable = shown(value), out;
    for (char c : printable) {
        if (c == '\\' || c == '"')
            out += '\\';
        out += c;
    }
    return "\"" + out + "\"";
}

static void
series(std::string& out, const char* name, const char* help, const std::string& lines)
{
    out += std::string("# HELP ") + name + " " + help + "\n# TYPE " + name + " gauge\n" + lines;
}

std::string
metrics_report(const velm_report& r)
{
    std::string out;
    int health = r.health == "healthy" ? 0 : r.health == "degraded" ? 1 : 2;
    series(out, "tzlinks_health", "Health of the time-zone data: 0 healthy, 1 degraded, 2 broken.",
           "tzlinks_health " + std::to_string(health) + "\n");
    std::string datasets;
    const std::pair<const char*, const velm_dataset_facts*> roles[] = {
        {"live", &r.live}, {"system", &r.system}, {"latest", &r.latest}};
    for (const auto& [role, d] : roles) {
        if (d->present)
            datasets += std::string("tzlinks_dataset_info{role=\"") + role +
                        "\",version=" + label(d->version) + ",icu_schema=" + label(d->icu_schema) +
                        "} 1\n";
    }
    series(out, "tzlinks_dataset_info",
           "The datasets: the one in use (live), the system's, and the update tz_latest names.",
           datasets);
    series(out, "tzlinks_next_boot_info", "What the next boot does: keep, adopt, reset or fail.",
           "tzlinks_next_boot_info{action=" + label(r.next_boot.action) + "} 1\n");
    std::string findings;
    for (const velm_finding& f : r.findings)
        findings += "tzlinks_finding_info{id=" + label(f.id) + ",severity=" + label(f.severity) +
                    ",subject=" + label(f.subject) + "} 1\n";
    series(out, "tzlinks_finding_info", "A finding of the report, by what it is about.", findings);
    series(out, "tzlinks_report_timestamp_seconds", "When the report was made.",
           "tzlinks_report_timestamp_seconds " + std::to_string(time(nullptr)) + "\n");
    return out;
}

// Into directory/tzlinks.prom, atomically: written whole under another
// name the collector ignores, then renamed over the old file, so that it
// never reads half of one.
bool
write_metrics(const std::string& directory, const std::string& text)
{
    std::string temporary = directory + "/.tzlinks.prom.XXXXXX";
    int fd = mkstemp(temporary.data());
    bool written = fd >= 0 && fchmod(fd, 0644) == 0 &&
                   write(fd, text.data(), text.size()) == static_cast<ssize_t>(text.size()) &&
                   fsync(fd) == 0;
    if (fd >= 0 && close(fd) != 0)
        written = false;
    written = written && rename(temporary.c_str(), (directory + "/tzlinks.prom").c_str()) == 0;
    if (!written) {
        warn("cannot write %s/tzlinks.prom", directory.c_str());
        if (fd >= 0)
            (void)unlink(temporary.c_str());
    }
    return written;
}
