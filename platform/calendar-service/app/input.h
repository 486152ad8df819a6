// SPDX-License-Identifier: Apache-2.0
//
// From the options of a command line to an event: what was given is checked and applied, everything
// else of the event stays.
#pragma once

#include <cstdint>
#include <string>

#include "platform/calendar-service/app/app.h"
#include "platform/calendar-service/app/event.h"

namespace calendar_app {

// Applies the options to an event; a new event needs a title and a start, any other is given its
// changes. The usage failure says which option is wrong.
void apply_new(const Options& options, calendar_text::Event* event);
void apply_changes(const Options& options, calendar_text::Event* event);

// The start of the occurrence that a text names: its day alone or its exact time, on the clock of
// the event's zone unless the text says otherwise. Fails when the rule makes none there or several.
std::int64_t find_occurrence(const calendar_text::Event& event, const std::string& text);

// Carries a cancelled or moved occurrence, named by its compact text, over to changed times of its
// event: as far from the new start as it was from the old one.
std::string carried_occurrence(const std::string& text, const calendar_text::Event& before,
                               const calendar_text::Event& after);

}  // namespace calendar_app
