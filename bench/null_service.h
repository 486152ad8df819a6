// SPDX-License-Identifier: Apache-2.0
//
// A device that does nothing, in place of the development platform: a program that links it gives
// the adapter these functions. Every event is the one of the document floor, nothing is stored,
// ids and versions only count up. The database utility opens real files. Single-threaded.
#pragma once

#include <array>
#include <vector>

// The properties of a change record, in their order: event id, status, book and version.
using NullChange = std::array<int, 4>;

inline constexpr int kNullBook = 1;

// The last event id and change version that were given.
void null_service_reset(int last);

// The change list of every later query.
void null_service_set_changes(std::vector<NullChange> changes);

// Calls the subscribed callback.
void null_service_notify();

// How often a function of the service was called.
long null_service_calls();
