// Fuzzes the recovery of a dataset root from the target of the zoneinfo
// link: whatever the target, the result is a root the rest of the tool can
// build a dataset from, or a warning and the error value -1.
#include "captured_warnings.h"
#include "dataset/dataset.h"

#include <cstdint>
#include <string>

namespace {

const std::string update_prefix = "/var/db/timezone/tz/";
const std::string system_target = "/usr/share/zoneinfo.default";

// Random bytes rarely spell either known beginning; the first byte may ask
// for one of them to be put in front of the rest.
std::string
target_from(const uint8_t* data, size_t size)
{
    std::string target(reinterpret_cast<const char*>(data), size);
    if (target.empty())
        return target;
    char mode = target[0];
    if (mode == 'u')
        return update_prefix + target.substr(1);
    if (mode == 's')
        return system_target + target.substr(1);
    return target;
}

// What the target must give, worked out without the code under test: the
// root of <root>/<last component> below the update prefix, with a
// non-empty first component, or "" for the system partition.
bool
reference_root(const std::string& target, std::string& root)
{
    if (target == system_target) {
        root.clear();
        return true;
    }
    if (target.size() <= update_prefix.size() ||
        target.compare(0, update_prefix.size(), update_prefix) != 0)
        return false;
    size_t last_slash = target.find_last_of('/');
    if (last_slash <= update_prefix.size())
        return false;
    root = target.substr(0, last_slash);
    return true;
}

void
check_root(const std::string& target, const std::string& root)
{
    if (root.empty()) {
        fuzz_require(target == system_target, "only the system target gives the empty root",
                     target);
        return;
    }
    fuzz_require(root.compare(0, update_prefix.size(), update_prefix) == 0,
                 "a root lies below the update prefix", target);
    fuzz_require(root.size() > update_prefix.size(), "a root names a directory below the prefix",
                 target);
    fuzz_require(root.size() < target.size() && target.compare(0, root.size(), root) == 0 &&
                     target[root.size()] == '/',
                 "a root is the target up to a '/'", target);
}

} // namespace

extern "C" int
LLVMFuzzerInitialize(int*, char***)
{
    capture_warnings();
    return 0;
}

extern "C" int
LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    std::string target = target_from(data, size);
    std::string expected;
    bool good = reference_root(target, expected);

    std::string root;
    bool thrown = false;
    try {
        root = dataset_path_from_zoneinfo_link(target);
    } catch (int value) {
        fuzz_require(value == -1, "a bad link throws -1", target);
        thrown = true;
    }
    std::string warnings = take_warnings();

    if (thrown) {
        fuzz_require(!good, "only a bad link throws", target);
        // warn(3) prints the target up to its first NUL byte.
        std::string start = warning_start("Bad zoneinfo link " + std::string(target.c_str()));
        fuzz_require(warnings.compare(0, start.size(), start) == 0 &&
                         warnings.find('\n', start.size()) == warnings.size() - 1,
                     "a bad link writes one warning naming it", target);
        return 0;
    }
    fuzz_require(good, "a bad link is refused", target);
    fuzz_require(warnings.empty(), "a good link writes nothing", target);
    fuzz_require(root == expected, "the root matches the reference", target);
    check_root(target, root);
    return 0;
}
