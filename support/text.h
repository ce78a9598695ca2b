// SPDX-License-Identifier: Apache-2.0
// Texts as every program shows them. A link target, a file's word or a
// name may hold any bytes: in text, control characters and what is not
// valid UTF-8 are escaped as \xHH, so that nothing reaches a terminal as a
// command or reorders a line; in JSON, as JSON escapes and \udcHH.
#ifndef TZLINKS_SUPPORT_TEXT_H
#define TZLINKS_SUPPORT_TEXT_H

#include <optional>
#include <string>

// Texts longer than this are shown cut, the cut marked.
const size_t longest_text = 8192;

// A text as the text report shows it: cut, escaped.
std::string shown(const std::string& text);
// A JSON string: cut, escaped; whole when it has to stay whole (a command).
std::string json_text(const std::string& text, bool whole = false);
std::string json_text(const std::optional<std::string>& text); // null when none

#endif
