#include "operations.h"

#include "dataset/dataset.h"
#include "dataset/icu.h"
#include "dataset/zoneinfo.h"
#include "support/fs.h"

#include <cerrno>
#include <map>
#include <set>
#include <stdexcept>

namespace {

// Answers a fixed compatible_schema and counts how often it was asked.
class fake_component final : public velm_dataset_component {
  public:
    explicit fake_component(bool yes) : answer(yes) {}
    bool compatible_schema(const velm_dataset_component&) const override
    {
        ++asked;
        return answer;
    }
    void activate() const override {}
    bool answer;
    mutable int asked = 0;
};

// "true 1 0": the answer, then how often each of mine was asked.
std::string
compare_lists(const std::string& mine, const std::string& theirs)
{
    velm_component_list a, b;
    std::vector<std::shared_ptr<fake_component>> fakes;
    for (char answer : mine) {
        fakes.push_back(std::make_shared<fake_component>(answer == 'y'));
        a.push_back(fakes.back());
    }
    for (char answer : theirs)
        b.push_back(std::make_shared<fake_component>(answer == 'y'));
    std::string result = compatible_components(a, b) ? "true" : "false";
    for (const auto& fake : fakes)
        result += " " + std::to_string(fake->asked);
    return result;
}

std::string
fields(const velm_version& v)
{
    return std::to_string(v.year) + " " + v.letters + " " + std::to_string(v.minor1) + " " +
           std::to_string(v.minor2);
}

// Starts from a parsed version so that a failed parse visibly resets every
// field and a range error visibly leaves some.
std::string
parse(const std::string& text)
{
    velm_version version(std::string("1999zz.5.6"));
    try {
        velm_version_parse(version, text);
    } catch (...) {
        throw std::out_of_range(fields(version));
    }
    return fields(version);
}

// "-" stands for a version in the default state.
std::string
order(const std::string& a_text, const std::string& b_text)
{
    velm_version a = a_text == "-" ? velm_version() : velm_version(a_text);
    velm_version b = b_text == "-" ? velm_version() : velm_version(b_text);
    std::string relation = a > b ? "newer" : b > a ? "older" : "not-ordered";
    return relation + (a == b ? " equal" : "");
}

std::string
summary(const std::string& root)
{
    velm_dataset dataset(root);
    const auto& parts = dataset.get_components();
    return dataset.get_version_string() + " = " + fields(dataset.get_version()) + " | " +
           dynamic_cast<const velm_zoneinfo&>(*parts.at(0)).get_data_dir() + " | " +
           dynamic_cast<const velm_icu&>(*parts.at(1)).get_data_dir() + " | " +
           dynamic_cast<const velm_icu&>(*parts.at(1)).get_schema();
}

std::string
yes_no(bool value)
{
    return value ? "true" : "false";
}

using operation = std::string (*)(const std::vector<std::string>&);

const std::map<std::string, operation> operations = {
    {"remove", [](const auto& a) { return velm_fs::remove(a.at(1)), std::string(); }},
    {"exists", [](const auto& a) { return yes_no(velm_fs::path_exists(a.at(1))); }},
    {"readlink", [](const auto& a) { return velm_fs::read_symlink(a.at(1)); }},
    {"symlink",
     [](const auto& a) { return velm_fs::create_symlink(a.at(1), a.at(2)), std::string(); }},
    {"parse", [](const auto& a) { return parse(a.at(1)); }},
    {"order", [](const auto& a) { return order(a.at(1), a.at(2)); }},
    {"link", [](const auto& a) { return dataset_path_from_zoneinfo_link(a.at(1)); }},
    {"current", [](const auto&) { return current_dataset_path(); }},
    {"latest", [](const auto&) { return latest_dataset_path(); }},
    {"dataset", [](const auto& a) { return summary(a.at(1)); }},
    {"words",
     [](const auto&) {
         return velm_zoneinfo().get_version_text() + "|" + velm_icu().get_schema();
     }},
    {"schema", [](const auto& a) { return velm_icu(a.at(1)).get_schema(); }},
    {"lists", [](const auto& a) { return compare_lists(a.at(1), a.at(2)); }},
    {"icu-compatible",
     [](const auto& a) {
         velm_icu system, update(a.at(1));
         errno = 0;
         return yes_no(update.compatible_schema(system));
     }},
    {"icu-vs-zoneinfo",
     [](const auto&) { return yes_no(velm_icu().compatible_schema(velm_zoneinfo())); }},
    {"zoneinfo-vs-icu",
     [](const auto&) { return yes_no(velm_zoneinfo().compatible_schema(velm_icu())); }},
    {"activate-zoneinfo",
     [](const auto& a) { return velm_zoneinfo(a.at(1)).activate(), std::string(); }},
    {"activate-icu", [](const auto& a) { return velm_icu(a.at(1)).activate(), std::string(); }},
    {"activate-dataset",
     [](const auto& a) { return velm_dataset(a.at(1)).activate(), std::string(); }},
    {"force", [](const auto&) { return force_system_dataset(), std::string(); }},
};

const std::set<std::string> pure = {"parse", "order", "link", "lists"};

} // namespace

std::string
perform(const std::vector<std::string>& call)
{
    return operations.at(call.at(0))(call);
}

bool
touches_files(const std::string& operation)
{
    return pure.count(operation) == 0;
}
