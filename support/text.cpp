// SPDX-License-Identifier: Apache-2.0
#include "support/text.h"

#include <algorithm>
#include <cstdio>

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

// A text no longer than longest_text bytes, or its start with the cut
// marked; never cut inside a UTF-8 character.
static std::string
cut(const std::string& text)
{
    if (text.size() <= longest_text)
        return text;
    size_t end = longest_text;
    while (end > longest_text - 3 && (static_cast<unsigned char>(text[end]) & 0xc0) == 0x80)
        --end;
    return text.substr(0, end) + "[cut]";
}

// Whether the character at text[i], n bytes long, is a control character:
// C0 (and DEL) or C1 (U+0080 to U+009F, which terminals obey too); or one
// that reorders or breaks a line where it is shown: U+061C, U+200E, U+200F,
// U+2028 to U+202E and U+2066 to U+2069, which could make a path read as
// another.
static bool
control(const std::string& text, size_t i, size_t n)
{
    auto at = [&text, i](size_t k) { return static_cast<unsigned char>(text[i + k]); };
    if (n == 1)
        return at(0) < 0x20 || at(0) == 0x7f;
    if (n == 2)
        return (at(0) == 0xc2 && at(1) < 0xa0) || (at(0) == 0xd8 && at(1) == 0x9c);
    bool general = n == 3 && at(0) == 0xe2 && at(1) == 0x80,
         isolates = n == 3 && at(0) == 0xe2 && at(1) == 0x81;
    return (general && ((at(2) >= 0x8e && at(2) <= 0x8f) || (at(2) >= 0xa8 && at(2) <= 0xae))) ||
           (isolates && at(2) >= 0xa6 && at(2) <= 0xa9);
}

// Valid UTF-8 as it is; a control character, or a byte that is not part of
// valid UTF-8, as \xHH, each of its bytes.
std::string
shown(const std::string& whole)
{
    std::string text = cut(whole), out;
    for (size_t i = 0; i < text.size();) {
        size_t n = utf8_length(text, i);
        if (n == 0 || control(text, i, n)) {
            for (size_t k = 0; k < std::max(n, size_t(1)); ++k)
                out += hex("\\x%02x", static_cast<unsigned char>(text[i + k]));
            n = std::max(n, size_t(1));
        } else {
            out.append(text, i, n);
        }
        i += n;
    }
    return out;
}

// A JSON string. A byte that is not part of valid UTF-8 becomes \udcHH,
// the surrogate escape: decoders that know it give the byte back. A text
// longer than longest_text is cut, but for a command, which has to run.
std::string
json_text(const std::string& text, bool whole)
{
    std::string kept = whole ? text : cut(text), out = "\"";
    for (size_t i = 0; i < kept.size();) {
        size_t n = utf8_length(kept, i);
        auto c = static_cast<unsigned char>(kept[i]);
        if (n == 0)
            out += hex("\\udc%02x", c), n = 1;
        else if (c == '"' || c == '\\')
            out += std::string("\\") + kept[i];
        else if (c < 0x20)
            out += hex("\\u%04x", c);
        else
            out.append(kept, i, n);
        i += n;
    }
    return out + "\"";
}

std::string
json_text(const std::optional<std::string>& text)
{
    return text ? json_text(*text) : "null";
}
