// SPDX-License-Identifier: Apache-2.0
//
// qor-cloud import and export.
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <nlohmann/json.hpp>

#include "cli/terminal.h"
#include "host/cloud/qor_cloud_commands.h"
#include "host/ics/ics_export.h"
#include "host/ics/ics_import.h"
#include "host/ics/ics_zones.h"

namespace qor {
namespace {

using nlohmann::ordered_json;

constexpr std::size_t kLongestExample = 40;

struct ImportedFile {
    std::string name;
    std::optional<Error> error;
    ImportSummary summary;
};

ordered_json report_json(const IcsReport& report) {
    ordered_json json{{"not_carried", ordered_json::array()},
                      {"zones", ordered_json::object()},
                      {"problems", ordered_json::array()}};
    for (const auto& [kind, entry] : report.not_carried) {
        json["not_carried"].push_back(
            {{"kind", kind}, {"count", entry.count}, {"example", entry.example}});
    }
    for (const auto& [name, meaning] : report.zones) {
        json["zones"][name] = meaning;
    }
    for (const Problem& problem : report.problems) {
        json["problems"].push_back(
            {{"where", problem.where}, {"title", problem.title}, {"problem", problem.what}});
    }
    return json;
}

std::string dumped(const ordered_json& json) {
    return json.dump(2, ' ', false, ordered_json::error_handler_t::replace) + "\n";
}

void print_report(const IcsReport& report, std::FILE* out) {
    const bool colour = isatty(fileno(out)) != 0;
    if (!report.zones.empty()) {
        Table table({"ZONE IN THE FILE", "UNDERSTOOD AS"});
        for (const auto& [name, meaning] : report.zones) {
            table.add({name, meaning});
        }
        fmt::print(out, "\n{}", table.text(colour));
    }
    if (!report.not_carried.empty()) {
        Table table({"NOT CARRIED BY DOCUMENTS", "COUNT", "FOR EXAMPLE"});
        table.right_align({1});
        for (const auto& [kind, entry] : report.not_carried) {
            table.add({kind, std::to_string(entry.count),
                       shortened(one_line(entry.example), kLongestExample)});
        }
        fmt::print(out, "\n{}", table.text(colour));
    }
}

void print_problems(const IcsReport& report) {
    for (const Problem& problem : report.problems) {
        const std::string title =
            problem.title.empty() ? "" : fmt::format(" \"{}\":", one_line(problem.title));
        fmt::print(stderr, "qor-cloud: warning: {}:{} {}\n", problem.where, title,
                   one_line(problem.what));
    }
}

ordered_json summary_json(const ImportedFile& file) {
    ordered_json json{{"file", file.name}};
    if (file.error) {
        json["error"] = file.error->message;
        return json;
    }
    const ImportSummary& summary = file.summary;
    json.update({{"events", summary.events},
                 {"changed_occurrences", summary.changed_occurrences},
                 {"cancelled_occurrences", summary.cancelled_occurrences},
                 {"added", summary.added},
                 {"changed", summary.changed},
                 {"unchanged", summary.unchanged},
                 {"kept", summary.kept}});
    json.update(report_json(summary.report));
    return json;
}

// One table for all files; what they hold and what became of it.
void print_summaries(const std::vector<ImportedFile>& files, bool dry_run) {
    Table table({"FILE", "EVENTS", "CHANGED OCC.", "CANCELLED OCC.", "ADDED", "CHANGED",
                 "UNCHANGED", "KEPT"});
    table.right_align({1, 2, 3, 4, 5, 6, 7});
    IcsReport all;
    for (const ImportedFile& file : files) {
        if (file.error) {
            continue;
        }
        const ImportSummary& s = file.summary;
        std::vector<std::string> cells{file.name};
        for (const std::size_t number : {s.events, s.changed_occurrences, s.cancelled_occurrences,
                                         s.added, s.changed, s.unchanged, s.kept}) {
            cells.push_back(std::to_string(number));
        }
        table.add(std::move(cells));
        all.zones.insert(s.report.zones.begin(), s.report.zones.end());
        for (const auto& [kind, entry] : s.report.not_carried) {
            NotCarried& sum = all.not_carried[kind];
            sum.example = sum.count == 0 ? entry.example : sum.example;
            sum.count += entry.count;
        }
    }
    if (!table.empty()) {
        fmt::print("{}{}", dry_run ? "Nothing was written; an import would do this:\n" : "",
                   table.text(isatty(STDOUT_FILENO) != 0));
        print_report(all, stdout);
    }
}

// The store to import into. In a dry run it may be missing: then everything is new.
Result<std::optional<CloudStore>> store_for_import(const CloudArguments& arguments) {
    const CloudOptions options{.who = arguments.who, .create = !arguments.dry_run};
    Result<CloudStore> store = CloudStore::open(arguments.cloud, options);
    if (store) {
        return std::optional<CloudStore>(*std::move(store));
    }
    if (arguments.dry_run && store.error().kind == ErrorKind::kMissing) {
        return std::optional<CloudStore>();
    }
    return store.error();
}

Exit status_of(const std::vector<ImportedFile>& files) {
    std::size_t failed = 0;
    bool partly = false;
    for (const ImportedFile& file : files) {
        failed += file.error ? 1 : 0;
        partly = partly || !file.summary.report.problems.empty();
    }
    if (failed == files.size()) {
        return Exit::kFailed;
    }
    return failed > 0 || partly ? Exit::kPartly : Exit::kDone;
}

// A text file that appears whole or not at all, or stdout.
class OutputFile {
  public:
    explicit OutputFile(const std::string& path) : path_(path) {
        if (path == "-") {
            file_ = stdout;
        } else {
            temporary_ = path + ".part";
            file_ = std::fopen(temporary_.c_str(), "wbe");
        }
        error_ = file_ == nullptr ? errno : 0;
    }
    ~OutputFile() {
        if (file_ != nullptr && file_ != stdout) {
            std::fclose(file_);
            std::remove(temporary_.c_str());
        }
    }
    OutputFile(const OutputFile&) = delete;
    OutputFile& operator=(const OutputFile&) = delete;

    bool write(std::string_view text) {
        if (file_ == nullptr || std::fwrite(text.data(), 1, text.size(), file_) != text.size()) {
            error_ = errno;
            return false;
        }
        return true;
    }
    bool finish() {
        if (file_ == stdout) {
            const bool done = std::fflush(stdout) == 0;
            error_ = done ? 0 : errno;
            return done;
        }
        std::FILE* file = file_;
        file_ = nullptr;
        const bool done = std::fflush(file) == 0 && fsync(fileno(file)) == 0;
        const bool named =
            (std::fclose(file) == 0 && done) && std::rename(temporary_.c_str(), path_.c_str()) == 0;
        error_ = named ? 0 : errno;
        return named;
    }
    std::string reason() const { return std::strerror(error_); }

  private:
    std::string path_;
    std::string temporary_;
    std::FILE* file_ = nullptr;
    int error_ = 0;
};

}  // namespace

Exit cloud_import(const CloudArguments& arguments) {
    if (!arguments.zone.empty() && olson_zone(arguments.zone).empty()) {
        print_error(
            fmt::format("--zone {}: no such zone; give one like Europe/Berlin", arguments.zone));
        return Exit::kUsage;
    }
    Result<std::optional<CloudStore>> store = store_for_import(arguments);
    if (!store) {
        return fail(store.error());
    }
    std::vector<ImportedFile> files;
    for (const std::string& path : arguments.files) {
        Progress progress(path);
        const ImportOptions options{
            .floating_zone = arguments.zone.empty() ? "" : olson_zone(arguments.zone),
            .overwrite = arguments.overwrite,
            .dry_run = arguments.dry_run,
            .progress = [&](std::size_t done, std::size_t total) { progress.show(done, total); }};
        Result<ImportSummary> summary =
            import_ics(path, store->has_value() ? &**store : nullptr, options);
        ImportedFile file{path, std::nullopt, {}};
        if (summary) {
            file.summary = *std::move(summary);
        } else {
            file.error = summary.error();
        }
        files.push_back(std::move(file));
    }
    for (const ImportedFile& file : files) {
        print_problems(file.summary.report);
        if (file.error) {
            print_error(file.error->message);
        }
    }
    if (arguments.json) {
        ordered_json json{{"cloud", arguments.cloud}, {"dry_run", arguments.dry_run}};
        for (const ImportedFile& file : files) {
            json["files"].push_back(summary_json(file));
        }
        fmt::print("{}", dumped(json));
    } else {
        print_summaries(files, arguments.dry_run);
    }
    return status_of(files);
}

Exit cloud_export(const CloudArguments& arguments) {
    const Result<CloudStore> store = CloudStore::open(arguments.cloud, {.who = arguments.who});
    if (!store) {
        return fail(store.error());
    }
    OutputFile out(arguments.output);
    const Result<ExportSummary> summary =
        export_ics(*store, [&](std::string_view text) { return out.write(text); });
    if (!summary && summary.error().kind != ErrorKind::kOther) {
        return fail(summary.error());
    }
    if (!summary || !out.finish()) {
        print_error(fmt::format("{}: {}; nothing was exported", arguments.output, out.reason()));
        return Exit::kFailed;
    }
    print_problems(summary->report);
    // The calendar itself may be on stdout; what is said about it then goes to stderr.
    std::FILE* const place = arguments.output == "-" ? stderr : stdout;
    if (arguments.json) {
        ordered_json json{{"file", arguments.output},
                          {"events", summary->events},
                          {"changed_occurrences", summary->changed_occurrences},
                          {"cancelled_occurrences", summary->cancelled_occurrences}};
        json.update(report_json(summary->report));
        fmt::print(place, "{}", dumped(json));
    } else {
        fmt::print(place, "Exported {}, {} and {} to {}\n", plural(summary->events, "event"),
                   plural(summary->changed_occurrences, "changed occurrence"),
                   plural(summary->cancelled_occurrences, "cancelled occurrence"),
                   arguments.output == "-" ? "standard output" : arguments.output);
        print_report(summary->report, place);
    }
    return summary->report.problems.empty() ? Exit::kDone : Exit::kPartly;
}

}  // namespace qor
