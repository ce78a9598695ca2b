// SPDX-License-Identifier: Apache-2.0
// The ICU time-zone data of a dataset. Two ICU components are
// interchangeable only when their schemas (format tags such as 44l) match.
#ifndef TZLINKS_DATASET_ICU_H
#define TZLINKS_DATASET_ICU_H

#include "dataset/dataset_component.h"

#include <string>

// The schema an update's ICU data file spells in its name: for a name that
// is icutz<digits><l, b or e>.dat as a whole, the part between icutz and
// .dat; for any other name, the empty string.
std::string velm_icu_schema_in_name(const std::string& name);
// The name of the ICU data file an update's directory holds, as the boot
// finds it: the first, in the directory's own order, whose name spells a
// schema and that is a regular file readable by others; "" when none is.
// schema, when given, gets the schema its name spells.
std::string velm_icu_data_file(const std::string& directory, std::string* schema = nullptr);

class velm_icu final : public velm_dataset_component {
  public:
    explicit velm_icu(const std::string& root);

    // True when other is an ICU component with the very same schema.
    bool compatible_schema(const velm_dataset_component& other) const override;
    // Clears both ICU links, then points /var/db/timezone/icutz at
    // data_dir for an update; the system partition's data needs no link.
    void activate() const override;

    const std::string& get_schema() const { return schema; }

  private:
    void initialize();
    void find_update_schema();

    std::string schema;
    std::string data_dir;
};

#endif
