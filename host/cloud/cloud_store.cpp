// SPDX-License-Identifier: Apache-2.0
//
// The cloud store. A document's row holds its latest state only; since the row with the highest
// revision can only be replaced by a higher one, that maximum is the store's revision.
#include "host/cloud/cloud_store.h"

#include <fcntl.h>
#include <fmt/format.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <nlohmann/json.hpp>
#include <thread>

#include "host/cloud/sqlite.h"

namespace qor {
namespace {

constexpr int kApplicationId = 0x516f7243;  // marks the file as a cloud, for us and for file(1)
constexpr int kSchemaVersion = 1;
constexpr std::size_t kLongestKey = 400;

constexpr const char* kSchema =
    "CREATE TABLE document ("
    " key TEXT PRIMARY KEY NOT NULL, revision INTEGER UNIQUE NOT NULL, deleted INTEGER NOT NULL,"
    " text TEXT NOT NULL, parent_key TEXT NOT NULL, title TEXT NOT NULL,"
    " modified_ms INTEGER NOT NULL, modified_by TEXT NOT NULL, origin TEXT NOT NULL);"
    "CREATE INDEX document_parent ON document (parent_key) WHERE parent_key <> '';"
    "CREATE TABLE log ("
    " revision INTEGER PRIMARY KEY NOT NULL, time_ms INTEGER NOT NULL, who TEXT NOT NULL,"
    " what TEXT NOT NULL, key TEXT NOT NULL, title TEXT NOT NULL);"
    "CREATE INDEX log_key ON log (key);";

#define QOR_DOCUMENT_COLUMNS \
    "key, revision, deleted, text, parent_key, title, modified_ms, modified_by, origin"
constexpr const char* kHead = "SELECT ifnull(max(revision), 0) FROM document";
constexpr const char* kGet = "SELECT " QOR_DOCUMENT_COLUMNS " FROM document WHERE key = ?1";
constexpr const char* kChanges =
    "SELECT " QOR_DOCUMENT_COLUMNS " FROM document WHERE revision > ?1 ORDER BY revision LIMIT ?2";
constexpr const char* kOccurrences =
    "SELECT " QOR_DOCUMENT_COLUMNS
    " FROM document WHERE parent_key = ?1 AND parent_key <> '' AND NOT deleted ORDER BY revision";
constexpr const char* kDocuments =
    "SELECT " QOR_DOCUMENT_COLUMNS " FROM document WHERE NOT deleted ORDER BY revision";
constexpr const char* kPut = "INSERT OR REPLACE INTO document (" QOR_DOCUMENT_COLUMNS
                             ") VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9)";
#undef QOR_DOCUMENT_COLUMNS
constexpr const char* kAddLog =
    "INSERT INTO log (revision, time_ms, who, what, key, title) VALUES (?1, ?2, ?3, ?4, ?5, ?6)";
constexpr const char* kLog =
    "SELECT revision, time_ms, who, what, key, title FROM"
    " (SELECT * FROM log WHERE ?1 = '' OR key = ?1 ORDER BY revision DESC LIMIT ?2)"
    " ORDER BY revision";

CloudDocument document_from_row(const Statement& row) {
    return {row.text(0), row.integer(1), row.integer(2) != 0, row.text(3), row.text(4),
            row.text(5), row.integer(6), row.text(7),         row.text(8)};
}

std::int64_t now_ms() {
    using std::chrono::duration_cast, std::chrono::milliseconds, std::chrono::system_clock;
    return duration_cast<milliseconds>(system_clock::now().time_since_epoch()).count();
}

bool usable_key(const std::string& key) {
    return !key.empty() && key.size() <= kLongestKey && std::ranges::all_of(key, [](char c) {
        return c > ' ' && c < 0x7f && c != '\'' && c != '"';
    });
}

// What the store itself reads in a document.
struct Outline {
    std::string title;
    std::string parent_key;
    bool cancelled = false;
};

std::string string_member(const nlohmann::json& object, const char* name) {
    const auto member = object.find(name);
    return member != object.end() && member->is_string() ? member->get<std::string>()
                                                         : std::string();
}

std::optional<Outline> outline_of(const std::string& text) {
    const auto document = nlohmann::json::parse(text, nullptr, false);
    if (!document.is_object()) {
        return std::nullopt;
    }
    const auto event = document.find("EVENT");
    if (event == document.end() || !event->is_object()) {
        return std::nullopt;
    }
    return Outline{string_member(*event, "title"), string_member(*event, "original_sync_id"),
                   string_member(*event, "eventStatus") == "2"};
}

Status make_file(const std::string& path) {
    const int file = ::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
    if (file < 0) {
        const auto kind = errno == EACCES || errno == EROFS ? ErrorKind::kReadOnly
                          : errno == ENOSPC                 ? ErrorKind::kFull
                                                            : ErrorKind::kMissing;
        return Error{kind, fmt::format("{}: cannot be made ({})", path, std::strerror(errno))};
    }
    ::close(file);
    return Done{};
}

}  // namespace

struct CloudStore::State {
    std::string path;
    std::string notify_path;
    CloudOptions options;
    Database db;
    Statement head, get, changes, occurrences, documents, put, add_log, log;

    Error failure(std::string_view doing) const { return sqlite_error(db.get(), path, doing); }
    bool run(const char* sql) const {
        return sqlite3_exec(db.get(), sql, nullptr, nullptr, nullptr) == SQLITE_OK;
    }
    Result<std::int64_t> number(const char* sql) const;
    Status connect();
    Status use_write_ahead_log();
    Status make_schema();
    Status prepare();
    void notify(std::int64_t revision) const;
    Result<std::vector<CloudDocument>> read_all(StatementRun& run, std::string_view doing) const;
    Result<std::optional<CloudDocument>> read_one(std::string_view key);
    Result<std::int64_t> read_head();
    Result<WriteResult> apply(const CloudWrite& write, std::int64_t& revision);
    Result<std::string> title_for(const Outline& outline);
    Status store(const CloudDocument& document, std::string_view what);
};

Result<std::int64_t> CloudStore::State::number(const char* sql) const {
    Statement statement;
    if (statement.prepare(db.get(), sql) != SQLITE_OK || statement.step() != SQLITE_ROW) {
        return failure("opening it");
    }
    return statement.integer(0);
}

Status CloudStore::State::connect() {
    sqlite3* handle = nullptr;
    const int rc = sqlite3_open_v2(path.c_str(), &handle,
                                   SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOMUTEX, nullptr);
    db.reset(handle);
    if (rc != SQLITE_OK) {
        return failure("opening it");
    }
    sqlite3_busy_timeout(handle, options.busy_timeout_ms);
    const Result<std::int64_t> tables = number("SELECT count(*) FROM sqlite_schema");
    if (!tables) {
        return tables.error();
    }
    if (*tables == 0) {
        if (!options.create) {
            return Error{ErrorKind::kForeign, fmt::format("{}: empty, not a cloud file", path)};
        }
        if (Status made = make_schema(); !made) {
            return made;
        }
    }
    const Result<std::int64_t> id = number("PRAGMA application_id");
    const Result<std::int64_t> version = number("PRAGMA user_version");
    if (!id || !version) {
        return id ? version.error() : id.error();
    }
    if (*id != kApplicationId) {
        return Error{ErrorKind::kForeign, fmt::format("{}: not a cloud file", path)};
    }
    if (*version != kSchemaVersion) {
        return Error{ErrorKind::kForeign,
                     fmt::format("{}: written by a newer program (format {}, this one reads {})",
                                 path, *version, kSchemaVersion)};
    }
    return prepare();
}

// The switch to the write-ahead log does not wait for others as statements do, so it is retried.
Status CloudStore::State::use_write_ahead_log() {
    const auto until =
        std::chrono::steady_clock::now() + std::chrono::milliseconds(options.busy_timeout_ms);
    while (!run("PRAGMA journal_mode = WAL")) {
        const int code = sqlite3_errcode(db.get()) & 0xff;
        if ((code != SQLITE_BUSY && code != SQLITE_LOCKED) ||
            std::chrono::steady_clock::now() > until) {
            return failure("making it");
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    return Done{};
}

Status CloudStore::State::make_schema() {
    if (Status done = use_write_ahead_log(); !done) {
        return done;
    }
    Transaction transaction(db.get());
    if (!transaction.begin(true)) {
        return failure("making it");
    }
    const Result<std::int64_t> tables = number("SELECT count(*) FROM sqlite_schema");
    if (!tables) {
        return tables.error();
    }
    if (*tables != 0) {
        return Done{};  // another process was quicker
    }
    const std::string marks = fmt::format("PRAGMA application_id = {}; PRAGMA user_version = {}",
                                          kApplicationId, kSchemaVersion);
    if (!run(kSchema) || !run(marks.c_str()) || !transaction.commit()) {
        return failure("making it");
    }
    return Done{};
}

Status CloudStore::State::prepare() {
    const std::pair<Statement*, const char*> statements[] = {
        {&head, kHead},           {&get, kGet}, {&changes, kChanges}, {&occurrences, kOccurrences},
        {&documents, kDocuments}, {&put, kPut}, {&add_log, kAddLog},  {&log, kLog},
    };
    if (!run("PRAGMA synchronous = FULL")) {
        return failure("opening it");
    }
    for (const auto& [statement, sql] : statements) {
        if (statement->prepare(db.get(), sql) != SQLITE_OK) {
            return failure("opening it");
        }
    }
    return Done{};
}

// A watcher that misses this is woken by the next change; the documents are stored already, so a
// touch file that cannot be written is no failure of the write.
void CloudStore::State::notify(std::int64_t revision) const {
    const int file = ::open(notify_path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
    if (file >= 0) {
        const std::string text = fmt::format("{}\n", revision);
        static_cast<void>(!::write(file, text.data(), text.size()));  // the closing is the signal
        ::close(file);
    }
}

Result<std::vector<CloudDocument>> CloudStore::State::read_all(StatementRun& run,
                                                               std::string_view doing) const {
    std::vector<CloudDocument> found;
    int rc = SQLITE_ROW;
    while ((rc = run->step()) == SQLITE_ROW) {
        found.push_back(document_from_row(*run.operator->()));
    }
    if (rc != SQLITE_DONE) {
        return failure(doing);
    }
    return found;
}

Result<std::optional<CloudDocument>> CloudStore::State::read_one(std::string_view key) {
    StatementRun run(get);
    run->bind(1, key);
    Result<std::vector<CloudDocument>> found = read_all(run, "reading a document");
    if (!found) {
        return found.error();
    }
    return found->empty() ? std::nullopt : std::optional(std::move(found->front()));
}

Result<std::int64_t> CloudStore::State::read_head() {
    StatementRun run(head);
    if (run->step() != SQLITE_ROW) {
        return failure("reading the revision");
    }
    return run->integer(0);
}

// A cancelled occurrence has no title of its own; people know it by its parent's.
Result<std::string> CloudStore::State::title_for(const Outline& outline) {
    if (!outline.title.empty() || outline.parent_key.empty()) {
        return outline.title;
    }
    const Result<std::optional<CloudDocument>> parent = read_one(outline.parent_key);
    if (!parent) {
        return parent.error();
    }
    return parent->has_value() ? (*parent)->title : std::string();
}

Status CloudStore::State::store(const CloudDocument& document, std::string_view what) {
    StatementRun row(put);
    row->bind(1, document.key);
    row->bind(2, document.revision);
    row->bind(3, document.deleted ? 1 : 0);
    row->bind(4, document.text);
    row->bind(5, document.parent_key);
    row->bind(6, document.title);
    row->bind(7, document.modified_ms);
    row->bind(8, document.modified_by);
    row->bind(9, document.origin);
    if (row->step() != SQLITE_DONE) {
        return failure("writing a document");
    }
    StatementRun line(add_log);
    line->bind(1, document.revision);
    line->bind(2, document.modified_ms);
    line->bind(3, document.modified_by);
    line->bind(4, what);
    line->bind(5, document.key);
    line->bind(6, options.log_titles ? std::string_view(document.title) : std::string_view());
    if (line->step() != SQLITE_DONE) {
        return failure("writing the log");
    }
    return Done{};
}

Result<WriteResult> CloudStore::State::apply(const CloudWrite& write, std::int64_t& revision) {
    const Result<std::optional<CloudDocument>> found = read_one(write.key);
    if (!found) {
        return found.error();
    }
    const std::optional<CloudDocument>& old = *found;
    const bool live = old.has_value() && !old->deleted;
    const std::int64_t present = old.has_value() ? old->revision : 0;
    const bool gone = old.has_value() && old->deleted;
    if (write.expected.has_value() &&
        !(*write.expected == 0 ? !live : *write.expected == present)) {
        return WriteResult{WriteOutcome::kConflict, present, gone};
    }
    const bool same_origin =
        write.origin.empty() || (old.has_value() && old->origin == write.origin);
    if (write.deleted ? !live : (live && old->text == write.text && same_origin)) {
        return WriteResult{WriteOutcome::kUnchanged, present, gone};
    }
    CloudDocument fresh;
    fresh.key = write.key;
    fresh.revision = ++revision;
    fresh.deleted = write.deleted;
    fresh.modified_ms = now_ms();
    fresh.modified_by = options.who;
    fresh.origin = write.origin.empty() && old.has_value() ? old->origin : write.origin;
    const char* what = "delete";
    if (write.deleted) {
        fresh.parent_key = old->parent_key;
        fresh.title = options.log_titles ? old->title : std::string();
    } else {
        const std::optional<Outline> outline = outline_of(write.text);
        if (!outline) {
            return Error{
                ErrorKind::kInput,
                fmt::format("{}: the text for {} is not an event document", path, write.key)};
        }
        Result<std::string> title = title_for(*outline);
        if (!title) {
            return title.error();
        }
        fresh.text = write.text;
        fresh.parent_key = outline->parent_key;
        fresh.title = std::move(*title);
        what = outline->cancelled ? "cancel" : live ? "change" : gone ? "restore" : "add";
    }
    if (const Status stored = store(fresh, what); !stored) {
        return stored.error();
    }
    return WriteResult{WriteOutcome::kWritten, fresh.revision, fresh.deleted};
}

CloudStore::CloudStore(std::unique_ptr<State> state) : state_(std::move(state)) {}
CloudStore::CloudStore(CloudStore&&) noexcept = default;
CloudStore& CloudStore::operator=(CloudStore&&) noexcept = default;
CloudStore::~CloudStore() = default;

const std::string& CloudStore::notify_path() const {
    return state_->notify_path;
}
const std::string& CloudStore::path() const {
    return state_->path;
}

Result<CloudStore> CloudStore::open(const std::string& path, const CloudOptions& options) {
    auto state = std::make_unique<State>();
    state->path = path;
    state->notify_path = path + ".changed";
    state->options = options;
    struct stat info {};
    if (::stat(path.c_str(), &info) != 0) {
        if (errno != ENOENT || !options.create) {
            return Error{errno == EACCES ? ErrorKind::kReadOnly : ErrorKind::kMissing,
                         fmt::format("{}: {}", path, std::strerror(errno))};
        }
        if (const Status made = make_file(path); !made) {
            return made.error();
        }
    } else if (!S_ISREG(info.st_mode)) {
        return Error{ErrorKind::kForeign, fmt::format("{}: not a cloud file", path)};
    }
    if (const Status connected = state->connect(); !connected) {
        return connected.error();
    }
    if (::stat(state->notify_path.c_str(), &info) != 0) {
        state->notify(0);
    }
    return CloudStore(std::move(state));
}

Result<std::int64_t> CloudStore::revision() const {
    return state_->read_head();
}

Result<std::optional<CloudDocument>> CloudStore::get(std::string_view key) const {
    return state_->read_one(key);
}

Result<CloudChanges> CloudStore::changes(std::int64_t since, std::size_t limit) const {
    Transaction transaction(state_->db.get());
    if (!transaction.begin(false)) {
        return state_->failure("reading changes");
    }
    const Result<std::int64_t> head = state_->read_head();
    if (!head) {
        return head.error();
    }
    CloudChanges result;
    {
        StatementRun run(state_->changes);
        run->bind(1, since);
        run->bind(2, limit == 0 ? std::int64_t{-1} : static_cast<std::int64_t>(limit) + 1);
        Result<std::vector<CloudDocument>> found = state_->read_all(run, "reading changes");
        if (!found) {
            return found.error();
        }
        result.documents = std::move(*found);
    }
    result.revision = *head;
    if (limit != 0 && result.documents.size() > limit) {
        result.documents.resize(limit);
        result.revision = result.documents.back().revision;
        result.more = true;
    }
    return result;
}

Result<std::vector<CloudDocument>> CloudStore::occurrences(std::string_view parent_key) const {
    StatementRun run(state_->occurrences);
    run->bind(1, parent_key);
    return state_->read_all(run, "reading occurrences");
}

Result<std::vector<CloudDocument>> CloudStore::documents() const {
    StatementRun run(state_->documents);
    return state_->read_all(run, "reading documents");
}

Result<std::vector<WriteResult>> CloudStore::write(const std::vector<CloudWrite>& writes) {
    for (const CloudWrite& write : writes) {
        if (!usable_key(write.key)) {
            return Error{ErrorKind::kInput,
                         fmt::format("{}: \"{}\" cannot be a key", state_->path, write.key)};
        }
    }
    Transaction transaction(state_->db.get());
    if (!transaction.begin(true)) {
        return state_->failure("waiting to write");
    }
    const Result<std::int64_t> head = state_->read_head();
    if (!head) {
        return head.error();
    }
    std::vector<WriteResult> results;
    results.reserve(writes.size());
    std::int64_t revision = *head;
    for (const CloudWrite& write : writes) {
        Result<WriteResult> result = state_->apply(write, revision);
        if (!result) {
            return result.error();
        }
        results.push_back(*result);
    }
    if (revision == *head) {
        return results;  // the transaction ends empty
    }
    if (!transaction.commit()) {
        return state_->failure("storing documents");
    }
    state_->notify(revision);
    return results;
}

Result<WriteResult> CloudStore::write(const CloudWrite& write) {
    Result<std::vector<WriteResult>> results = this->write(std::vector<CloudWrite>{write});
    if (!results) {
        return results.error();
    }
    return results->front();
}

Result<std::vector<CloudLogEntry>> CloudStore::log(std::size_t limit, std::string_view key) const {
    StatementRun run(state_->log);
    run->bind(1, key);
    run->bind(2, limit == 0 ? std::int64_t{-1} : static_cast<std::int64_t>(limit));
    std::vector<CloudLogEntry> entries;
    int rc = SQLITE_ROW;
    while ((rc = run->step()) == SQLITE_ROW) {
        entries.push_back({run->integer(0), run->integer(1), run->text(2), run->text(3),
                           run->text(4), run->text(5)});
    }
    if (rc != SQLITE_DONE) {
        return state_->failure("reading the log");
    }
    return entries;
}

}  // namespace qor
