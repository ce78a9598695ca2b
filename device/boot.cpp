// SPDX-License-Identifier: Apache-2.0
#include "device/boot.h"

#include "dataset/dataset.h"
#include "dataset/icu.h"
#include "driver/startup.h"
#include "support/paths.h"

#include <cerrno>
#include <err.h>
#include <sys/mman.h>
#include <sysexits.h>
#include <unistd.h>

velm_caught_messages::velm_caught_messages()
    : saved(dup(2)), caught(memfd_create("messages", MFD_CLOEXEC)),
      name(program_invocation_short_name)
{
    if (saved < 0 || caught < 0 || dup2(caught, 2) < 0)
        err(EX_OSERR, "cannot catch the boot's messages");
    program_invocation_short_name = const_cast<char*>("tzlinks");
}

velm_caught_messages::~velm_caught_messages()
{
    (void)dup2(saved, 2);
    (void)close(saved);
    (void)close(caught);
    program_invocation_short_name = name;
}

std::vector<std::string>
velm_caught_messages::lines() const
{
    std::string text(static_cast<size_t>(std::max(lseek(caught, 0, SEEK_END), off_t(0))), '\0');
    text.resize(
        static_cast<size_t>(std::max(pread(caught, text.data(), text.size(), 0), ssize_t(0))));
    std::vector<std::string> all;
    for (size_t at = 0, end; (end = text.find('\n', at)) != std::string::npos; at = end + 1)
        all.push_back(text.substr(at, end - at));
    return all;
}

velm_text
link_at(velm_simulation& tree, const std::string& path)
{
    velm_entry entry = tree.look(path);
    return entry.kind == velm_entry::link && entry.error == 0 ? velm_text(entry.text)
                                                              : std::nullopt;
}

velm_dataset_facts
facts_of(const velm_dataset& dataset)
{
    velm_dataset_facts facts;
    facts.present = true;
    facts.root = dataset.get_root();
    facts.version = dataset.get_version_string();
    facts.version_understood = dataset.get_version().year >= 0;
    facts.icu_schema = dynamic_cast<const velm_icu&>(*dataset.get_components().at(1)).get_schema();
    return facts;
}

namespace {

// Keeps what the start-up sequence tells of its decision.
class velm_reasons final : public velm_startup_watcher {
  public:
    explicit velm_reasons(velm_run& into) : run(into) {}
    void not_understood() override { run.understood = false; }
    void current(const velm_dataset& current, const velm_dataset& system, bool compatible,
                 bool older, bool kept) override
    {
        run.kept = kept;
        run.system = facts_of(system);
        run.current = facts_of(current);
        run.current.compatible = compatible, run.current.older = older;
    }
    void latest(const velm_dataset& latest, const velm_dataset& system, bool compatible, bool newer,
                bool adopted) override
    {
        run.adopted = adopted;
        run.latest = facts_of(latest);
        run.latest.compatible = compatible, run.latest.newer = newer;
        run.latest.older = system > latest;
    }
    void abandoned() override { run.abandoned = true; }

  private:
    velm_run& run;
};

} // namespace

std::optional<velm_refusal>
refusal_of(const velm_run& next, const velm_run* after)
{
    const velm_dataset_facts& latest = next.latest;
    bool refused = latest.present && !next.adopted;
    if (!refused && !(next.adopted && after != nullptr && !after->kept))
        return std::nullopt;
    const std::string& want = next.system.icu_schema;
    if (!latest.compatible && latest.icu_schema.empty())
        return velm_refusal{"latest-no-icu",
                            "which has no ICU data the boot can use (a regular file " +
                                latest.root + "/icutz/icutz" + want + ".dat, readable by others)"};
    if (!latest.compatible)
        return velm_refusal{"latest-other-schema", "whose ICU data has schema " +
                                                       latest.icu_schema + "; the system's is " +
                                                       (want.empty() ? "none" : want)};
    if (latest.older)
        return velm_refusal{"latest-older-than-system",
                            "older than the system data, " + next.system.version};
    return velm_refusal{"latest-older",
                        "which is not newer than the data in use, " + next.current.version};
}

velm_run
simulate_boot(velm_simulation& tree)
{
    velm_run run;
    velm_text before = link_at(tree, velm_path::zoneinfo_link);
    tree.refusals.clear();
    tree.forget_writes();
    {
        velm_caught_messages caught;
        velm_calls_in_use simulated(tree);
        velm_reasons reasons(run);
        errno = 0; // as in a process just started
        run.exit_status = run_startup_sequence(&reasons);
        run.messages = caught.lines();
    }
    run.refused = tree.refusals;
    run.zoneinfo = link_at(tree, velm_path::zoneinfo_link);
    run.icutz = link_at(tree, velm_path::icutz_link);
    run.localtime = link_at(tree, velm_path::localtime_link);
    if (tree.written(velm_path::record))
        run.record = tree.look(velm_path::record).text;
    run.action = run.exit_status != 0                         ? "fail"
                 : run.zoneinfo == before                     ? "keep"
                 : run.zoneinfo == velm_path::system_zoneinfo ? "reset"
                                                              : "adopt";
    return run;
}
