// SPDX-License-Identifier: Apache-2.0
//
// How the command-line tools end.
#pragma once

namespace qor {

enum class Exit {
    kDone = 0,
    kPartly = 1,  // done but for the items that were listed
    kUsage = 2,   // the command line makes no sense; nothing was done
    kFailed = 3,
};

}  // namespace qor
