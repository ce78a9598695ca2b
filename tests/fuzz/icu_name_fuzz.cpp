// Fuzzes how an update's ICU schema is read from the name of its data file:
// each input becomes one entry in a real icutz directory, and the component
// built over it must find exactly the schema the name spells, and only from
// a readable regular file.
#include "captured_warnings.h"
#include "dataset/icu.h"

#include <cstdint>
#include <cstdlib>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

namespace {

std::string root;     // the dataset root the component is built from
std::string data_dir; // root + "/icutz", where the entry is made
std::string elsewhere;

void
remove_scratch()
{
    unlink(elsewhere.c_str());
    rmdir(data_dir.c_str());
    rmdir(root.c_str());
}

void
make_scratch()
{
    const char* tmp = getenv("TMPDIR");
    std::string pattern = std::string(tmp ? tmp : "/tmp") + "/tzlinks-icu-fuzz.XXXXXX";
    if (mkdtemp(pattern.data()) == nullptr)
        abort();
    root = pattern;
    data_dir = root + "/icutz";
    elsewhere = root + "/icutz44l.dat";
    int fd = open(elsewhere.c_str(), O_CREAT | O_WRONLY, 0644);
    if (mkdir(data_dir.c_str(), 0755) != 0 || fd < 0 || fchmod(fd, 0644) != 0)
        abort();
    close(fd);
    atexit(remove_scratch);
}

// "icutz", one or more digits and one of l, b, e, then ".dat": the schema
// is the digits and the letter.
std::string
reference_schema(const std::string& name)
{
    const std::string head = "icutz";
    const std::string tail = ".dat";
    if (name.size() < head.size() + 2 + tail.size() || name.compare(0, head.size(), head) != 0 ||
        name.compare(name.size() - tail.size(), tail.size(), tail) != 0)
        return std::string();
    std::string schema = name.substr(head.size(), name.size() - head.size() - tail.size());
    char letter = schema.back();
    if (letter != 'l' && letter != 'b' && letter != 'e')
        return std::string();
    if (schema.find_first_not_of("0123456789") != schema.size() - 1)
        return std::string();
    return schema;
}

// A name a directory can hold: the walk never meets any other.
bool
is_file_name(const std::string& name)
{
    return !name.empty() && name.size() <= 255 && name != "." && name != ".." &&
           name.find_first_of(std::string("/\0", 2)) == std::string::npos;
}

enum class entry_kind { readable_file, private_file, directory, link };

entry_kind
kind_from(char mode)
{
    switch (mode) {
    case 'p':
        return entry_kind::private_file;
    case 'd':
        return entry_kind::directory;
    case 'l':
        return entry_kind::link;
    default:
        return entry_kind::readable_file;
    }
}

// Creates the entry; false when the file system refuses the name.
bool
make_entry(const std::string& path, entry_kind kind)
{
    if (kind == entry_kind::directory)
        return mkdir(path.c_str(), 0755) == 0;
    if (kind == entry_kind::link)
        return symlink(elsewhere.c_str(), path.c_str()) == 0;
    int fd = open(path.c_str(), O_CREAT | O_EXCL | O_WRONLY, 0600);
    if (fd < 0)
        return false;
    fchmod(fd, kind == entry_kind::readable_file ? 0644 : 0640);
    close(fd);
    return true;
}

void
remove_entry(const std::string& path, entry_kind kind)
{
    if (kind == entry_kind::directory)
        rmdir(path.c_str());
    else
        unlink(path.c_str());
}

} // namespace

extern "C" int
LLVMFuzzerInitialize(int*, char***)
{
    capture_warnings();
    make_scratch();
    return 0;
}

extern "C" int
LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    if (size == 0)
        return 0;
    entry_kind kind = kind_from(static_cast<char>(data[0]));
    std::string name(reinterpret_cast<const char*>(data) + 1, size - 1);
    if (!is_file_name(name))
        return 0;
    std::string path = data_dir + "/" + name;
    if (!make_entry(path, kind))
        return 0;

    velm_icu icu(root);
    std::string warnings = take_warnings();
    remove_entry(path, kind);

    std::string expected = kind == entry_kind::readable_file ? reference_schema(name) : "";
    fuzz_require(icu.get_schema() == expected, "the schema is what the file name spells", name);
    fuzz_require(icu.get_data_dir() == data_dir, "the data directory is root/icutz", name);
    std::string start = warning_start("No ICU schema found for " + root);
    bool warned = warnings.compare(0, start.size(), start) == 0;
    fuzz_require(expected.empty() ? warned : warnings.empty(),
                 "a missing schema, and only that, is warned", name);
    return 0;
}
