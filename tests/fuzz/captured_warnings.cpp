#include "captured_warnings.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>

static FILE* original_stderr = nullptr;
static char* buffer = nullptr;
static size_t buffer_size = 0;

void
capture_warnings()
{
    original_stderr = stderr;
    stderr = open_memstream(&buffer, &buffer_size);
    if (stderr == nullptr)
        abort();
}

std::string
take_warnings()
{
    // The write position, not the buffer size: after a rewind the buffer
    // still holds older, longer texts.
    fflush(stderr);
    long length = ftell(stderr);
    std::string text(buffer, static_cast<size_t>(length));
    rewind(stderr);
    return text;
}

std::string
warning_start(const std::string& message)
{
    return std::string(program_invocation_short_name) + ": " + message + ": ";
}

static std::string
printable(const std::string& text)
{
    std::string shown;
    for (char byte : text) {
        auto c = static_cast<unsigned char>(byte);
        if (c >= 0x20 && c < 0x7f && c != '\\') {
            shown += static_cast<char>(c);
            continue;
        }
        char escaped[8];
        snprintf(escaped, sizeof escaped, "\\x%02x", c);
        shown += escaped;
    }
    return shown;
}

void
fuzz_require(bool condition, const char* what, const std::string& input)
{
    if (condition)
        return;
    fprintf(original_stderr, "invariant broken: %s\ninput: \"%s\"\n", what,
            printable(input).c_str());
    fflush(original_stderr);
    abort();
}
