// Runs the tables in tests/tables/: each row builds a sample tree, calls
// one operation in this process or runs the real tzlinks binary, and
// compares the result, every line on standard error, what was thrown or the
// exit status, and the entries named afterwards. The format is described at
// the top of tests/tables/fs.rows.
#include "operations.h"
#include "run_tool.h"
#include "sandbox.h"

#include <cerrno>
#include <fstream>
#include <sstream>
#include <stdexcept>

namespace {

struct row {
    std::string name;
    std::string tree;
    std::vector<std::string> call; // empty: run the binary
    std::string out, thrown;
    std::vector<std::string> err; // ": message: strerror"
    int status = 0;
    std::vector<std::pair<std::string, std::string>> then;
};

void
PrintTo(const row& r, std::ostream* os)
{
    *os << r.name;
}

// \s space, \n \t \v \f \r, \xHH, \*N:c (N times c), \\; a lone "" is the
// empty string.
std::string
unescape(const std::string& text)
{
    if (text == "\"\"")
        return "";
    std::string plain;
    for (size_t i = 0; i < text.size(); ++i) {
        if (text[i] != '\\' || i + 1 == text.size()) {
            plain += text[i];
            continue;
        }
        char c = text[++i];
        if (c == '*') {
            size_t colon = text.find(':', i);
            plain.append(std::stoul(text.substr(i + 1, colon - i - 1)), text.at(colon + 1));
            i = colon + 1;
        } else if (c == 'x') {
            plain += static_cast<char>(std::stoi(text.substr(i + 1, 2), nullptr, 16));
            i += 2;
        } else {
            const std::string from = "sntvfr", to = " \n\t\v\f\r";
            size_t at = from.find(c);
            plain += at == std::string::npos ? c : to[at];
        }
    }
    return plain;
}

int
errno_named(const std::string& name)
{
    const std::pair<const char*, int> names[] = {
        {"0", 0},           {"ENOENT", ENOENT},   {"EINVAL", EINVAL}, {"EISDIR", EISDIR},
        {"EEXIST", EEXIST}, {"ENOTDIR", ENOTDIR}, {"ERANGE", ERANGE}};
    for (const auto& [known, value] : names)
        if (name == known)
            return value;
    throw std::invalid_argument("unknown errno name " + name);
}

// "err ENOENT message" lines; the program name is filled in later.
void
add_line(row& r, const std::string& rest)
{
    size_t space = rest.find(' ');
    r.err.push_back(": " + unescape(rest.substr(space + 1)) + ": " +
                    strerror(errno_named(rest.substr(0, space))));
}

void
add(row& r, const std::string& key, const std::string& rest)
{
    std::istringstream words(rest);
    if (key == "tree") {
        r.tree += rest + "\n";
    } else if (key == "call") {
        for (std::string word; words >> word;)
            r.call.push_back(unescape(word));
    } else if (key == "out") {
        r.out = unescape(rest);
    } else if (key == "throw") {
        r.thrown = rest;
    } else if (key == "err") {
        add_line(r, rest);
    } else if (key == "status") {
        r.status = std::stoi(rest);
    } else if (key == "then") {
        size_t space = rest.find(' ');
        r.then.emplace_back(rest.substr(0, space), unescape(rest.substr(space + 1)));
    } else if (key != "run") {
        throw std::invalid_argument("unknown key " + key);
    }
}

std::vector<row>
load(const std::string& table)
{
    std::ifstream in(std::string(TZLINKS_SOURCE_DIR) + "/tests/tables/" + table + ".rows");
    std::vector<row> rows;
    for (std::string line; std::getline(in, line);) {
        if (line.empty() || line[0] == '#')
            continue;
        size_t space = line.find(' ');
        std::string key = line.substr(0, space);
        std::string rest =
            space == std::string::npos ? "" : line.substr(line.find_first_not_of(' ', space));
        if (key == "==")
            rows.push_back({rest, "", {}, "", "", {}, 0, {}});
        else
            add(rows.back(), key, rest);
    }
    return rows;
}

// Prefixes every expected line with the name warn(3) will print.
std::string
expected_err(const std::vector<std::string>& lines, const std::string& program)
{
    std::string text;
    for (const std::string& line : lines)
        text += program + line + "\n";
    return text;
}

std::string
thrown_text(std::exception_ptr thrown)
{
    try {
        std::rethrow_exception(thrown);
    } catch (int value) {
        return "int " + std::to_string(value);
    } catch (const std::invalid_argument& e) {
        return std::string("invalid_argument ") + e.what();
    } catch (const std::out_of_range& e) {
        return std::string("out_of_range ") + e.what();
    } catch (...) {
        return "something else";
    }
}

class table : public sandbox_test, public ::testing::WithParamInterface<row> {
  protected:
    void SetUp() override
    {
        const row& r = GetParam();
        if (!r.call.empty() && r.tree.empty() && r.then.empty() && !touches_files(r.call[0]))
            return; // pure: no sandbox needed
        sandbox_test::SetUp();
    }
};

TEST_P(table, row)
{
    const row& r = GetParam();
    build_tree(r.tree);
    if (r.call.empty()) {
        tool_run run = run_tzlinks();
        EXPECT_EQ(run.err, expected_err(r.err, "tzlinks"));
        EXPECT_EQ(run.status, r.status);
        EXPECT_EQ(run.out, "");
    } else {
        std::string result, thrown;
        errno = 0; // warnings that follow no failed call then end in "Success"
        testing::internal::CaptureStderr();
        try {
            result = perform(r.call);
        } catch (...) {
            thrown = thrown_text(std::current_exception());
        }
        EXPECT_EQ(testing::internal::GetCapturedStderr(),
                  expected_err(r.err, program_invocation_short_name));
        EXPECT_EQ(result, r.out);
        EXPECT_EQ(thrown, r.thrown);
    }
    for (const auto& [path, after] : r.then)
        EXPECT_EQ(describe(path), after) << path;
}

std::string
row_name(const ::testing::TestParamInfo<row>& info)
{
    return info.param.name;
}

INSTANTIATE_TEST_SUITE_P(fs, table, ::testing::ValuesIn(load("fs")), row_name);
INSTANTIATE_TEST_SUITE_P(version, table, ::testing::ValuesIn(load("version")), row_name);
INSTANTIATE_TEST_SUITE_P(dataset, table, ::testing::ValuesIn(load("dataset")), row_name);
INSTANTIATE_TEST_SUITE_P(tool, table, ::testing::ValuesIn(load("tool")), row_name);

} // namespace
