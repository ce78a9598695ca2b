// SPDX-License-Identifier: Apache-2.0
// The compiled tz database of a dataset.
#ifndef TZLINKS_DATASET_ZONEINFO_H
#define TZLINKS_DATASET_ZONEINFO_H

#include "dataset/dataset_component.h"

#include <string>

class velm_zoneinfo final : public velm_dataset_component {
  public:
    explicit velm_zoneinfo(const std::string& root);

    // Any tz database can replace any other.
    bool compatible_schema(const velm_dataset_component& other) const override;
    // Points /var/db/timezone/zoneinfo at data_dir.
    void activate() const override;

    // First word of data_dir/+VERSION; empty when there is none. Only the
    // system partition's is kept whole.
    std::string get_version_text() const { return version_text; }

  private:
    void read_version();

    // Also the exact target of the live link, which is how the dataset
    // root is later recovered from that link.
    std::string data_dir;
    std::string version_text;
};

#endif
