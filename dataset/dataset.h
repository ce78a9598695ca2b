// SPDX-License-Identifier: Apache-2.0
// A complete set of time-zone data the device could use: the system
// partition's, or an update unpacked below /var/db/timezone/tz/.
#ifndef TZLINKS_DATASET_DATASET_H
#define TZLINKS_DATASET_DATASET_H

#include "dataset/dataset_component.h"
#include "support/version.h"

#include <memory>
#include <string>
#include <vector>

using velm_component_list = std::vector<std::shared_ptr<velm_dataset_component>>;

class velm_dataset {
  public:
    // The system partition's dataset.
    velm_dataset();
    // The dataset rooted at root; an empty root also means the system
    // partition. Throws invalid_argument("badpath") for a non-empty root
    // that is not below /var/db/timezone/tz/.
    explicit velm_dataset(const std::string& root);

    velm_dataset(const velm_dataset&) = delete;
    velm_dataset& operator=(const velm_dataset&) = delete;

    // Whether every component of this dataset can stand in for the one at
    // the same position in other.
    bool compatible(const velm_dataset& other) const;
    // Newer by version; nothing else is compared.
    bool operator>(const velm_dataset& other) const;
    // Activates every component in order; the first failure propagates.
    void activate() const;

    std::string get_version_string() const { return version_string; }
    const std::string& get_root() const { return root_path; }
    const velm_version& get_version() const { return version; }
    const velm_component_list& get_components() const { return components; }

  private:
    void create_components();

    velm_version version;
    std::string version_string;
    std::string root_path;
    velm_component_list components; // zoneinfo, then ICU
};

// The version string a tz release takes as a dataset: 2023c gives
// 2023c.1.0. The system partition's data is named so, and so is an update
// staged from a release.
std::string velm_release_version(const std::string& release);

// Makes the system partition's dataset live.
void force_system_dataset();
// The root named by /var/db/timezone/zoneinfo; "" for the system partition.
std::string current_dataset_path();
// The target of /var/db/timezone/tz_latest, unchecked; "" when absent.
std::string latest_dataset_path();

#endif
