// SPDX-License-Identifier: Apache-2.0
// One kind of time-zone data inside a dataset: the compiled tz database
// (velm_zoneinfo) or the ICU time-zone data (velm_icu).
#ifndef TZLINKS_DATASET_DATASET_COMPONENT_H
#define TZLINKS_DATASET_DATASET_COMPONENT_H

#include <string>

class velm_dataset_component {
  public:
    explicit velm_dataset_component(const std::string& root) : root_path(root) {}

    // Whether this component's data can stand in for other's.
    virtual bool compatible_schema(const velm_dataset_component& other) const = 0;
    // Makes this component's data live by relinking under /var/db/timezone.
    virtual void activate() const = 0;

    // The dataset's root, /var/db/timezone/tz/<version>; empty for the
    // system partition, which the components tell apart by this alone.
    const std::string root_path;

  protected:
    // Not virtual: components are owned through shared_ptr made from the
    // concrete type, which deletes them as that type. Protected so that
    // nothing can delete one through a plain base pointer.
    ~velm_dataset_component() = default;
};

#endif
