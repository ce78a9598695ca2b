#include "rows.h"

#include <algorithm>
#include <cstring>
#include <fstream>
#include <sstream>
#include <stdexcept>

static const std::string live_dir = "/var/db/timezone/";

std::string
unescape(const std::string& text)
{
    std::string plain;
    for (size_t i = 0; i < text.size(); ++i) {
        if (text[i] != '\\' || i + 1 == text.size()) {
            plain += text[i];
        } else if (text[++i] == '*') {
            size_t colon = text.find(':', i);
            plain.append(std::stoul(text.substr(i + 1, colon - i - 1)), text.at(colon + 1));
            i = colon + 1;
        } else {
            plain += text[i] == 's' ? ' ' : text[i] == 'n' ? '\n' : text[i];
        }
    }
    return plain;
}

// "ENOENT", "0", or a number that is no errno (strace can inject those).
static int
errno_named(const std::string& name)
{
    for (int e = 0; e < 4096; ++e) {
        const char* known = e == 0 ? "0" : strerrorname_np(e);
        if ((known != nullptr && name == known) || name == std::to_string(e))
            return e;
    }
    throw std::invalid_argument("no errno " + name);
}

static std::string
trim(const std::string& text)
{
    size_t first = text.find_first_not_of(' ');
    return first == std::string::npos ? ""
                                      : text.substr(first, text.find_last_not_of(' ') - first + 1);
}

static row
parse(std::string line)
{
    for (size_t at; (at = line.find('@')) != std::string::npos;)
        line.replace(at, 1, live_dir + "tz/");
    std::vector<std::string> fields;
    std::istringstream split(line);
    for (std::string field; std::getline(split, field, '|');)
        fields.push_back(trim(field));
    row r;
    std::istringstream head(fields.at(0));
    head >> r.name >> r.inject;
    r.inject = r.inject.substr(r.inject.find('=') + 1);
    r.tree = fields.at(1);
    std::istringstream words(fields.at(2));
    for (std::string word; words >> word;) {
        if (word.compare(0, 5, "exit=") == 0)
            r.exit = std::stoi(word.substr(5));
        else if (word.compare(0, 7, "report=") == 0)
            r.report = word.substr(7);
        else
            r.changes.push_back(unescape(word));
    }
    std::sort(r.changes.begin(), r.changes.end());
    for (size_t i = 3; i < fields.size(); ++i) {
        size_t space = fields[i].find(' ');
        r.err += "tzlinks: " + unescape(fields[i].substr(space + 1)) + ": " +
                 strerror(errno_named(fields[i].substr(0, space))) + "\n";
    }
    return r;
}

std::vector<row>
load_rows()
{
    std::ifstream in(TZLINKS_SOURCE_DIR "/tests/tool.rows");
    std::vector<std::string> lines;
    for (std::string line; std::getline(in, line);) {
        if (!line.empty() && line[0] == ' ' && !lines.empty())
            lines.back() += line;
        else if (!line.empty() && line[0] != '#')
            lines.push_back(line);
    }
    std::vector<row> rows;
    std::transform(lines.begin(), lines.end(), std::back_inserter(rows), parse);
    return rows;
}

static std::string
name_of(const std::string& path)
{
    return path.compare(0, live_dir.size(), live_dir) == 0 ? path.substr(live_dir.size()) : path;
}

std::vector<std::string>
changes(const std::map<std::string, std::string>& before,
        const std::map<std::string, std::string>& after)
{
    std::vector<std::string> changed;
    for (const auto& [path, what] : after) {
        auto was = before.find(path);
        if (was == before.end() || was->second != what)
            changed.push_back(name_of(path) + what);
    }
    for (const auto& [path, what] : before) {
        if (after.count(path) == 0)
            changed.push_back("-" + name_of(path));
    }
    std::sort(changed.begin(), changed.end());
    return changed;
}
