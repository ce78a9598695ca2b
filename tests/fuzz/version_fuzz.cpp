// Fuzzes the version parse against a hand-written reference reading of the
// version form, and the version order against the order of plain tuples,
// together with the laws any strict order and its equality must obey.
#include "captured_warnings.h"
#include "support/version.h"

#include <cerrno>
#include <cstdint>
#include <fuzzer/FuzzedDataProvider.h>
#include <stdexcept>
#include <string>
#include <tuple>

namespace {

// Directory names and link targets, where update version texts come from,
// are at most 1024 bytes; the megabyte-long texts a damaged +VERSION could
// hold are checked by the table tests, which would only slow fuzzing here.
const size_t longest_text = 1024;

enum class parse_kind { parsed, no_match, out_of_range };

struct expected_parse {
    parse_kind kind = parse_kind::no_match;
    velm_version value;
};

bool
is_digit(char c)
{
    return c >= '0' && c <= '9';
}

bool
is_letter(char c)
{
    return c >= 'a' && c <= 'z';
}

// The decimal value of a run of digits, or false when it exceeds int32_t.
bool
to_int32(const std::string& digits, int32_t& value)
{
    size_t first = digits.find_first_not_of('0');
    std::string significant = first == std::string::npos ? "0" : digits.substr(first);
    if (significant.size() > 10 || (significant.size() == 10 && significant > "2147483647"))
        return false;
    value = static_cast<int32_t>(std::stoll(significant));
    return true;
}

size_t
run_end(const std::string& text, size_t pos, bool (*in_run)(char))
{
    while (pos < text.size() && in_run(text[pos]))
        ++pos;
    return pos;
}

// digits, lower-case letters, then up to two groups of a point and digits,
// covering the whole text.
expected_parse
reference_parse(const std::string& text)
{
    expected_parse result;
    size_t digits_end = run_end(text, 0, is_digit);
    size_t letters_end = run_end(text, digits_end, is_letter);
    if (digits_end == 0 || letters_end == digits_end)
        return result;
    std::string minors[2];
    size_t pos = letters_end;
    for (std::string& minor : minors) {
        if (pos == text.size() || text[pos] != '.')
            break;
        size_t end = run_end(text, pos + 1, is_digit);
        if (end == pos + 1)
            return result;
        minor = text.substr(pos + 1, end - pos - 1);
        pos = end;
    }
    if (pos != text.size())
        return result;

    result.kind = parse_kind::out_of_range;
    velm_version& v = result.value;
    if (!to_int32(text.substr(0, digits_end), v.year))
        return result;
    v.letters = text.substr(digits_end, letters_end - digits_end);
    if (!minors[0].empty() && !to_int32(minors[0], v.minor1))
        return result;
    if (!minors[1].empty() && !to_int32(minors[1], v.minor2))
        return result;
    result.kind = parse_kind::parsed;
    return result;
}

bool
is_default(const velm_version& v)
{
    return v.year == -1 && v.letters.empty() && v.minor1 == -1 && v.minor2 == -1;
}

// Parses text into version, checking the outcome and the warnings against
// the reference. Returns false when the parse let out_of_range escape.
bool
checked_parse(const std::string& text, velm_version& version)
{
    expected_parse expected = reference_parse(text);
    // A record that held a version must come back fully reset on failure.
    version.year = 7;
    version.letters = "stale";
    errno = 0;
    bool escaped = false;
    try {
        velm_version_parse(version, text);
    } catch (const std::out_of_range&) {
        escaped = true;
    }
    std::string warnings = take_warnings();

    if (escaped) {
        fuzz_require(expected.kind == parse_kind::out_of_range,
                     "out_of_range only for a number beyond int32_t", text);
        fuzz_require(warnings.empty(), "out_of_range writes no warning", text);
        return false;
    }
    fuzz_require(expected.kind != parse_kind::out_of_range, "a number beyond int32_t escapes",
                 text);
    if (expected.kind == parse_kind::no_match) {
        fuzz_require(is_default(version), "a failed parse leaves the default state", text);
        // warn(3) prints the text up to its first NUL byte.
        std::string shown = text.c_str();
        std::string first =
            warning_start("Cannot parse version string " + shown + ", results.size() = 0");
        std::string second = warning_start("Cannot parse version string " + shown);
        fuzz_require(warnings.compare(0, first.size(), first) == 0 &&
                         warnings.find("\n" + second) != std::string::npos,
                     "a failed parse writes both warnings", text);
        return true;
    }
    fuzz_require(version == expected.value, "parsed fields match the reference", text);
    fuzz_require(warnings.empty(), "a good parse writes nothing", text);
    fuzz_require(velm_version(text) == version, "construction from text equals the parse", text);
    return true;
}

// A record with arbitrary fields, beyond what the parse can produce, so the
// order is checked on its whole domain.
velm_version
generated_version(FuzzedDataProvider& in)
{
    velm_version v;
    v.year = in.ConsumeIntegral<int32_t>();
    v.letters = in.ConsumeRandomLengthString(64);
    v.minor1 = in.ConsumeIntegral<int32_t>();
    v.minor2 = in.ConsumeIntegral<int32_t>();
    return v;
}

// Field by field, letters as unsigned bytes: what "newer" means.
bool
reference_newer(const velm_version& a, const velm_version& b)
{
    return std::tie(a.year, a.letters, a.minor1, a.minor2) >
           std::tie(b.year, b.letters, b.minor1, b.minor2);
}

void
check_pair(const velm_version& a, const velm_version& b, const std::string& input)
{
    fuzz_require((a > b) == reference_newer(a, b), "greater-than is field by field", input);
    fuzz_require(!(a > b && b > a), "greater-than is asymmetric", input);
    fuzz_require((a == b) == (b == a), "equality is symmetric", input);
    if (a == b)
        fuzz_require(!(a > b) && !(b > a), "equal records are not ordered", input);
    if (!(a > b) && !(b > a))
        fuzz_require(a == b, "unordered records are equal", input);
}

void
check_order(const velm_version (&v)[3], const std::string& input)
{
    const velm_version none;
    for (const velm_version& a : v) {
        fuzz_require(!(a > a), "greater-than is irreflexive", input);
        fuzz_require(a == a, "equality is reflexive", input);
        if (a.year >= 0)
            fuzz_require(a > none, "every parsed year is newer than the default", input);
        for (const velm_version& b : v) {
            check_pair(a, b, input);
            for (const velm_version& c : v) {
                if (a > b && b > c)
                    fuzz_require(a > c, "greater-than is transitive", input);
            }
        }
    }
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
    // Each parse compiles its pattern, which is slow under the sanitizers,
    // so one text is parsed per input and the other two records of the
    // triple are generated.
    if (size > 2 * longest_text)
        return 0;
    std::string input(reinterpret_cast<const char*>(data), size);
    FuzzedDataProvider in(data, size);
    velm_version v[3];
    if (!checked_parse(in.ConsumeRandomLengthString(longest_text), v[0]))
        return 0;
    v[1] = generated_version(in);
    v[2] = generated_version(in);
    check_order(v, input);
    return 0;
}
