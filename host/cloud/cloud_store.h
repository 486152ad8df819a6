// SPDX-License-Identifier: Apache-2.0
//
// The cloud: one SQLite file of event documents, shared by any number of hosts and tools at once.
// Write-ahead log, one durable commit per write call, a busy timeout for writers that meet.
// Every written document takes the next number of one growing revision; a deletion leaves a
// tombstone with a revision of its own, so that the change feed can tell of it for ever.
// One CloudStore belongs to one thread; threads and processes each open their own.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/result.h"

struct sqlite3;

namespace qor {

// A document as stored; a deletion is a document with `deleted` set and an empty text.
struct CloudDocument {
    std::string key;
    std::int64_t revision = 0;  // of its latest write
    bool deleted = false;
    std::string text;        // the event document (JSON)
    std::string parent_key;  // "original_sync_id" of an occurrence's document; empty otherwise
    std::string title;       // of the event; a cancelled occurrence carries its parent's
    std::int64_t modified_ms = 0;  // when it was written, since the epoch
    std::string modified_by;       // device or tool that wrote it
    std::string origin;  // digest left by the latest import of this key; kept by other writes
};

// One wished change. With `expected`, it happens only if the document's revision is that one still;
// 0 means: only if there is no live document of this key (a tombstone does not count).
struct CloudWrite {
    std::string key;
    std::string text;      // ignored for a deletion
    bool deleted = false;  // delete instead of store
    std::optional<std::int64_t> expected;
    std::string origin;  // non-empty replaces the stored origin
};

enum class WriteOutcome {
    kWritten,    // stored under `revision`
    kUnchanged,  // it already was so, byte by byte; nothing was written, `revision` is the present
                 // one
    kConflict,   // `expected` did not hold; nothing was written, `revision` is the present one
};

struct WriteResult {
    WriteOutcome outcome = WriteOutcome::kUnchanged;
    std::int64_t revision = 0;  // 0: there never was a document of this key
    bool deleted = false;       // what is stored now is a tombstone
};

// A consistent view of what changed: each key once, in the order of its latest revision.
struct CloudChanges {
    std::vector<CloudDocument> documents;
    std::int64_t revision = 0;  // pass it to the next changes(); nothing up to it is missing
    bool more = false;          // the limit was met; ask again from `revision`
};

// One line of the operation log.
struct CloudLogEntry {
    std::int64_t revision = 0;
    std::int64_t time_ms = 0;
    std::string who;   // the name given at open
    std::string what;  // "add", "change", "delete", "restore", "cancel" (an occurrence)
    std::string key;
    std::string title;
};

struct CloudOptions {
    std::string who = "unknown";  // device or tool name, for the log
    bool create = false;          // make the file when it is missing
    bool log_titles = true;       // write titles into the log
    int busy_timeout_ms = 10000;  // how long a writer waits for another one
};

class CloudStore {
  public:
    static Result<CloudStore> open(const std::string& path, const CloudOptions& options);
    CloudStore(CloudStore&&) noexcept;
    CloudStore& operator=(CloudStore&&) noexcept;
    ~CloudStore();

    // The highest revision given out; 0 when nothing was ever written. One indexed look-up.
    Result<std::int64_t> revision() const;

    // One document, tombstones included; no value when the key was never used.
    Result<std::optional<CloudDocument>> get(std::string_view key) const;

    // What changed after `since` (0: everything, tombstones included), at most `limit` documents
    // (0: all). Read in one transaction.
    Result<CloudChanges> changes(std::int64_t since, std::size_t limit = 0) const;

    // The live documents whose parent is this key, in order of revision.
    Result<std::vector<CloudDocument>> occurrences(std::string_view parent_key) const;

    // All live documents, in order of revision.
    Result<std::vector<CloudDocument>> documents() const;

    // Does the writes in order, in one transaction and one durable commit. A conflict concerns its
    // own write only; the others are stored. An error stores nothing. One result per write.
    // Deleting a document does not touch the documents of its occurrences. A batch in which
    // nothing has to be written writes nothing at all, and does not wake the watchers.
    Result<std::vector<WriteResult>> write(const std::vector<CloudWrite>& writes);
    Result<WriteResult> write(const CloudWrite& write);

    // Log lines, oldest first: the latest `limit` (0: all), of one key when `key` is not empty.
    Result<std::vector<CloudLogEntry>> log(std::size_t limit = 0, std::string_view key = {}) const;

    // A small file beside the database, rewritten and closed after every commit that changed
    // something (it holds the revision in decimal, as a hint): watch it for IN_CLOSE_WRITE.
    // It exists from the moment the store was opened.
    const std::string& notify_path() const;
    const std::string& path() const;

  private:
    struct State;
    explicit CloudStore(std::unique_ptr<State> state);
    std::unique_ptr<State> state_;
};

}  // namespace qor
