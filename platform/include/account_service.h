// SPDX-License-Identifier: Apache-2.0
//
// The device's account service: who is signed in. Functions return 0 or a negative code.
#ifndef QOR_PLATFORM_ACCOUNT_SERVICE_H
#define QOR_PLATFORM_ACCOUNT_SERVICE_H

// NOLINTBEGIN(modernize-use-using, modernize-deprecated-headers): C reads this header too.

#include <stdbool.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef enum {
    ACCOUNT_ERROR_NONE = 0,
    ACCOUNT_ERROR_OUT_OF_MEMORY = -12,
    ACCOUNT_ERROR_INVALID_PARAMETER = -22,
    ACCOUNT_ERROR_NO_DATA = -61,
    ACCOUNT_ERROR_NOT_CONNECTED = -107,
    ACCOUNT_ERROR_DB_FAILED = -5,
} account_error_e;

typedef struct account *account_h;

// Called for one account; the handle is valid during the call. False ends the enumeration.
typedef bool (*account_cb)(account_h account, void *user_data);

int account_connect(void);
int account_disconnect(void);

// Calls the callback for each account in the order of their ids, on the calling thread. Success
// also when there is no account or the callback ended the enumeration.
int account_foreach_account_from_db(account_cb callback, void *user_data);

// The account's user name as a new text that the caller frees with free().
int account_get_user_name(account_h account, char **out_user_name);
int account_get_account_id(account_h account, int *out_account_id);

// Managing accounts, for sign-in and sign-out tools. Adding a user name that exists gives its id.
int account_insert(const char *user_name, int *out_account_id);
int account_delete(int account_id);

#ifdef __cplusplus
}
#endif

// NOLINTEND(modernize-use-using, modernize-deprecated-headers)

#endif  // QOR_PLATFORM_ACCOUNT_SERVICE_H
