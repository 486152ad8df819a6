// SPDX-License-Identifier: Apache-2.0
//
// The query and filter functions, and their SQL.
#include "platform/calendar-service/query.h"

#include "platform/calendar-service/guard.h"

namespace device {

namespace {

constexpr char kWhere[] = " WHERE ";
constexpr char kAnd[] = " AND ";
constexpr char kEquals[] = " = ?";
constexpr char kRange[] = " ORDER BY id LIMIT ? OFFSET ?";
constexpr int kNoLimit = -1;

// Books and events are stored; null for another view, with the code that tells why.
const View* find_stored_view(const char* uri, int* out_code) {
    const View* const view = find_view(uri);
    *out_code = view == nullptr ? CALENDAR_ERROR_INVALID_PARAMETER : CALENDAR_ERROR_NOT_SUPPORTED;
    return view == &kBookView || view == &kEventView ? view : nullptr;
}

}  // namespace

std::string Selection::clauses() const {
    std::string sql;
    for (const Condition& condition : conditions) {
        sql += sql.empty() ? kWhere : kAnd;
        sql += view.properties[index_of(condition.property_id)].name;
        sql += kEquals;
    }
    return sql + kRange;
}

void Selection::bind(Run* run) const {
    for (const Condition& condition : conditions) {
        run->bind(condition.value);
    }
    run->bind(limit == 0 ? kNoLimit : limit).bind(offset);
}

}  // namespace device

int calendar_query_create(const char* view_uri, calendar_query_h* out_query) {
    int code = CALENDAR_ERROR_NONE;
    const device::View* const view = device::find_stored_view(view_uri, &code);
    if (out_query == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    if (view == nullptr) {
        return code;
    }
    return device::guarded([&] { *out_query = new calendar_query{*view, {}}; });
}

int calendar_query_destroy(calendar_query_h query) {
    delete query;
    return query == nullptr ? CALENDAR_ERROR_INVALID_PARAMETER : CALENDAR_ERROR_NONE;
}

int calendar_query_set_filter(calendar_query_h query, calendar_filter_h filter) {
    if (query == nullptr || filter == nullptr || &query->view != &filter->view ||
        !filter->complete) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    return device::guarded([&] { query->conditions = filter->conditions; });
}

int calendar_filter_create(const char* view_uri, calendar_filter_h* out_filter) {
    int code = CALENDAR_ERROR_NONE;
    const device::View* const view = device::find_stored_view(view_uri, &code);
    if (out_filter == nullptr) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    if (view == nullptr) {
        return code;
    }
    return device::guarded([&] { *out_filter = new calendar_filter{*view, {}}; });
}

int calendar_filter_destroy(calendar_filter_h filter) {
    delete filter;
    return filter == nullptr ? CALENDAR_ERROR_INVALID_PARAMETER : CALENDAR_ERROR_NONE;
}

int calendar_filter_add_int(calendar_filter_h filter, unsigned int property_id,
                            calendar_match_int_flag_e match, int value) {
    if (filter == nullptr || !device::is_property(filter->view, property_id, device::Type::kInt) ||
        (!filter->conditions.empty() && filter->complete)) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    if (device::raw_value(match) != CALENDAR_MATCH_EQUAL) {
        return CALENDAR_ERROR_NOT_SUPPORTED;
    }
    return device::guarded([&] {
        filter->conditions.push_back({property_id, value});
        filter->complete = true;
    });
}

int calendar_filter_add_operator(calendar_filter_h filter, calendar_filter_operator_e op) {
    if (filter == nullptr || filter->conditions.empty() || !filter->complete) {
        return CALENDAR_ERROR_INVALID_PARAMETER;
    }
    if (device::raw_value(op) != CALENDAR_FILTER_OPERATOR_AND) {
        return CALENDAR_ERROR_NOT_SUPPORTED;
    }
    filter->complete = false;
    return CALENDAR_ERROR_NONE;
}
