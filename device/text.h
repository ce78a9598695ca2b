// SPDX-License-Identifier: Apache-2.0
// A run of the boot as both programs show it.
#ifndef TZLINKS_DEVICE_TEXT_H
#define TZLINKS_DEVICE_TEXT_H

#include "device/boot.h"
#include "support/text.h"

#include <string>

// "  name -> target" or "  name: no link", and a line end.
std::string text_link(const char* name, const velm_text& target);
// A run of the boot, as text (a line for each thing it does) and as JSON.
std::string text_run(const velm_run& run);
std::string json_run(const velm_run& run);

#endif
