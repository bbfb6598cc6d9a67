// Lists and hashes as the imitated operations see them.

#ifndef VORN_TESTS_DOUBLE_CONTAINERS_H
#define VORN_TESTS_DOUBLE_CONTAINERS_H

#include <string>

#include "platform/core.h"
#include "tests/double/recording.h"

struct VLIBSZHASH {
    fake::Section entries;
};

namespace fake {

struct List : VLIBSZLIST {
    OptionalTexts entries;
};

// The entries of a live list.
const OptionalTexts& EntriesOf(const VLIBSZLIST* list);

// Appends to a live list, which may replace it.
void Append(VLIBSZLIST** list, const OptionalTexts& texts);

// Moves a list or hash to a new address when the appliance is set to do so, and really frees the old one.
void ReplaceList(VLIBSZLIST** list);
void ReplaceHash(VLIBSZHASH** hash, bool replace);

// The content of a list or hash as an argument's text; safe for pointers that aren't live.
std::string ListText(const VLIBSZLIST* list);
std::string HashText(const VLIBSZHASH* hash);

// Like Recording::Live for the address of a list's pointer.
bool LiveList(Recording& call, VLIBSZLIST** list);
bool LiveHash(Recording& call, VLIBSZHASH** hash);

}  // namespace fake

#endif
