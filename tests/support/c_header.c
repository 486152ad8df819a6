/* SPDX-License-Identifier: Apache-2.0 */
/* Compiles when the hosts' header is C11. */
#include "data-sync/qor_adapter_data_sync_calendar_event.h"
#include "platform/include/qor_platform.h"

int qor_c_header_compiles(void);
int qor_c_header_compiles(void) {
    return qor_adapter_data_sync_get_dependency();
}
