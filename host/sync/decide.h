// SPDX-License-Identifier: Apache-2.0
//
// Decides one key: what happened on both sides, and so what is to be done.
#pragma once

#include "host/sync/plan.h"

namespace qor {

// Adds to the plan. A conflict is decided by the policy; the document that loses is kept.
void decide(SyncContext& context, KeyChange change, Plan& plan);

// The delivery of a document to the device, by insert, update or replacement.
Delivery delivery_of(KeyChange change, SyncedDocument document, std::string text,
                     std::int64_t revision);

}  // namespace qor
