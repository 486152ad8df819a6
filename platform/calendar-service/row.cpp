// SPDX-License-Identifier: Apache-2.0
#include "platform/calendar-service/row.h"

#include <limits>

namespace device {

void bind_value(Run* run, Type type, const Value& value) {
    switch (type) {
        case Type::kInt:
            run->bind(value.integer);
            break;
        case Type::kText:
            run->bind(static_cast<const char*>(value.text));
            break;
        case Type::kDouble:
            run->bind(value.real);
            break;
        case Type::kTime:
            run->bind(value.time);
            break;
        case Type::kChildren:  // rows of their own
            break;
    }
}

void read_value(Run* run, Type type, Value* value) {
    switch (type) {
        case Type::kInt:
            value->integer = run->integer();
            break;
        case Type::kText:
            set_text(value, run->text());
            break;
        case Type::kDouble:
            value->real = run->real();
            break;
        case Type::kTime:
            value->time = run->time();
            break;
        case Type::kChildren:
            break;
    }
}

int inserted_id(Store& store) {
    const sqlite3_int64 id = sqlite3_last_insert_rowid(store.handle());
    if (id > std::numeric_limits<int>::max()) {
        throw Failure{CALENDAR_ERROR_DB_FAILED};
    }
    return static_cast<int>(id);
}

}  // namespace device
