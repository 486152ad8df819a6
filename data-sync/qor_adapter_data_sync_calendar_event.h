/* SPDX-License-Identifier: Apache-2.0 */
/*
 * The calendar-event sync adapter: the 23 entry points that a host sync framework calls. Compiles
 * as C11 and as C++.
 *
 * Item ids are decimal texts. An id text that the host passes is read with base-10 strtol: trailing
 * garbage is ignored and a text without digits is item 0. Arguments are checked in the order in
 * which they are told. What is handed to the host is allocated with malloc and freed with free(),
 * the document of get_value included (its generator uses the same allocator).
 *
 * Unless told otherwise an entry point takes no lock, runs on any thread of the host, and returns 6
 * when the adapter is not initialised. Initialise and deinitialise exclude every other call; that
 * is the host's duty. The host runs a GLib main loop.
 */
#ifndef QOR_ADAPTER_DATA_SYNC_CALENDAR_EVENT_H
#define QOR_ADAPTER_DATA_SYNC_CALENDAR_EVENT_H

#pragma GCC visibility push(default) /* everything else of the library is hidden */

#ifdef __cplusplus
#define QOR_NOEXCEPT noexcept
extern "C" {
#else
#define QOR_NOEXCEPT
#endif

/* The host's callback: something on the device has changed and is worth a sync. Runs on the main
 * loop on which the subscription was made, without the adapter's lock held. */
typedef void (*data_changed_callback)(void *user_data); /* NOLINT(modernize-use-using): also C */

/* ---- Identity: a new text through the argument (null when memory ran out); always 0 -------------
 */

int qor_adapter_get_cid(char **cid) QOR_NOEXCEPT;   /* "p3RwQZ7mNa" */
int qor_adapter_get_type(char **type) QOR_NOEXCEPT; /* "DATASYNC" */
int qor_adapter_get_name(char **name) QOR_NOEXCEPT; /* "CALENDAR" */

/* ---- Lifecycle
 * ------------------------------------------------------------------------------------- */

/* Opens the adapter database, connects to the calendar service, finds or creates the account's
 * calendar book and establishes the version baseline. is_signin is only logged. 0, or 6: the
 * adapter is then not initialised, whatever it was before. */
int qor_adapter_data_sync_initialize(int account_id, int is_signin) QOR_NOEXCEPT;

/* Closes everything; with is_signout 1 the calendar book is deleted and the event map emptied
 * first. 0, or 5 when the adapter is not initialised. */
int qor_adapter_data_sync_deinitialize(int is_signout) QOR_NOEXCEPT;

/* ---- Entries that do nothing: always 0
 * ------------------------------------------------------------- */

int qor_adapter_data_sync_get_dependency(void) QOR_NOEXCEPT;
int qor_adapter_data_sync_is_ors_supported(void) QOR_NOEXCEPT;
int qor_adapter_data_sync_get_deleted_folder(void) QOR_NOEXCEPT;
int qor_adapter_data_sync_set_metadata(void) QOR_NOEXCEPT;
int qor_adapter_data_sync_completed(void) QOR_NOEXCEPT;
int qor_adapter_data_sync_done(void) QOR_NOEXCEPT;
int qor_adapter_data_sync_clear_dirty_ids(void) QOR_NOEXCEPT;

/* Calendar events have no files: null through the last argument, the others are not read. */
int qor_adapter_data_sync_get_files_for_upsync(void *unused1, void *unused2, void *unused3,
                                               void *unused4, void *unused5, void *unused6,
                                               void *unused7, void *unused8,
                                               void **files) QOR_NOEXCEPT;
int qor_adapter_data_sync_get_files_for_downsync(void *unused1, void *unused2, void *unused3,
                                                 void *unused4, void *unused5,
                                                 void **files) QOR_NOEXCEPT;

/* ---- Change detection
 * ------------------------------------------------------------------------------ */

/* The changed items since the baseline, as a new array of new texts, in the order of the device's
 * change list. 0 with the array and its count, or with count 0 and no array when no change list is
 * pending; 1 with count 0 when one is pending but yields no ids; 6. Repeatable. */
int qor_adapter_data_sync_get_dirty_ids_p(char ***ids, int *count) QOR_NOEXCEPT;

/* The same for deleted items, whose numbers are forgotten by this call. A deleted event that never
 * was an item is listed as "-1". */
int qor_adapter_data_sync_get_deleted_ids_p(char ***ids, int *count) QOR_NOEXCEPT;

/* The host has taken all changes: drops the change list and advances the stored baseline. 0 or 6.
 */
int qor_adapter_data_sync_clear_deleted_ids(void) QOR_NOEXCEPT;

/* ---- Values
 * ------------------------------------------------------------------------------------------ */

/* The document of an item: 0 and a new text; 6; or, for an item that stands for nothing, the result
 * of the log call (neither 0 nor 6). The second text is only logged. */
int qor_adapter_data_sync_get_value(const char *item_id, const char *log_text,
                                    char **document) QOR_NOEXCEPT;

/* Creates an item from a document: 0 and its id as a new text ("0" when no row could be stored),
 * or 6. Takes the adapter mutex. */
int qor_adapter_data_sync_insert_value(const char *unused, const char *document,
                                       char **item_id) QOR_NOEXCEPT;

/* Replaces an item by a document: 0 or 6. Takes the adapter mutex. */
int qor_adapter_data_sync_update_value(const char *unused, const char *item_id,
                                       const char *document) QOR_NOEXCEPT;

/* Deletes an item: 0 or 6. Takes the adapter mutex. */
int qor_adapter_data_sync_delete_value(const char *item_id) QOR_NOEXCEPT;

/* ---- Notification
 * ------------------------------------------------------------------------------------ */

/* Subscribes to changes that the adapter did not make itself. 0; 4 for a null callback, initialised
 * or not; 6; or the calendar service's error. */
int qor_adapter_data_sync_set_data_changed_cb(data_changed_callback callback,
                                              void *user_data) QOR_NOEXCEPT;
int qor_adapter_data_sync_unset_data_changed_cb(void) QOR_NOEXCEPT;

#ifdef __cplusplus
}
#endif
#undef QOR_NOEXCEPT

#pragma GCC visibility pop

#endif /* QOR_ADAPTER_DATA_SYNC_CALENDAR_EVENT_H */
