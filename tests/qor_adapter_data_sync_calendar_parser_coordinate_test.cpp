// SPDX-License-Identifier: Apache-2.0
#include <cmath>
#include <cstdlib>

#include "tests/parser_test.h"
#include "tests/support/compiled_locale.h"

namespace {

struct Axis {
    std::string name;
    unsigned int property;
    int (*parse)(const char* text, calendar_record_h record);
    int (*make)(calendar_record_h record, char** text);
};

class CoordinateTest : public ParserTest {
  protected:
    const Axis axes_[2] = {
        {"latitude", _calendar_event.latitude, _qor_calendar_parse_latitude,
         _qor_calendar_make_latitude},
        {"longitude", _calendar_event.longitude, _qor_calendar_parse_longitude,
         _qor_calendar_make_longitude},
    };

    static std::string made(const Axis& axis, double degrees) {
        const Record event = new_event();
        EXPECT_EQ(calendar_record_set_double(event.get(), axis.property, degrees), 0);
        char* text = nullptr;
        EXPECT_EQ(axis.make(event.get(), &text), 0);
        return taken(text);
    }
};

// clang-format off
TEST_F(CoordinateTest, DegreesTravelAsMicroDegrees) {
    const struct {
        const char* text;
        double degrees;
        const char* again;
    } cases[] = {
        {"37566535", 37.566535, "37566535"},
        {"-122419416", -122.419416, "-122419416"},
        {"500000", 0.5, "0500000"},
        {"abc", 0.0, "0000000"},
        {"", 0.0, "0000000"},
        {"1000000000", 1000.0, "(null)"},  // reads back as no place
        {"99999999999999999999", 9223372036854.775807, "9223372036854775391"},
    };
    for (const Axis& axis : axes_) {
        for (const auto& c : cases) {
            SCOPED_TRACE(axis.name + " " + c.text);
            const Record event = new_event();
            EXPECT_EQ(axis.parse(c.text, event.get()), 0);
            double degrees = -1;
            EXPECT_EQ(calendar_record_get_double(event.get(), axis.property, &degrees), 0);
            EXPECT_EQ(degrees, c.degrees);
            EXPECT_EQ(made(axis, degrees), c.again);
        }
        EXPECT_EQ(made(axis, 12.3456789), "12345679");
        EXPECT_EQ(made(axis, -1e22), "-10000000000000000000000000000");
        EXPECT_EQ(logged(), "");
        for (const double degrees : {-1e24, 1e300, HUGE_VAL, std::nan("")}) {
            EXPECT_EQ(made(axis, degrees), "(null)");
            EXPECT_THAT(logged(), ::testing::HasSubstr(axis.name + ": no place: "));
        }
    }
}
// clang-format on

TEST_F(CoordinateTest, TheDecimalSeparatorOfTheHostDoesNotShow) {
    for (const char* locale : {"de_DE", "ps_AF"}) {  // a comma; a separator of two bytes
        const CompiledLocale there(locale, directory());
        ASSERT_STRNE(std::localeconv()->decimal_point, ".");
        EXPECT_EQ(made(axes_[0], -37.566535), "-37566535") << locale;
    }
}

TEST_F(CoordinateTest, FailuresAreReportedAndLeaveTheOutput) {
    const Record event = new_event();
    const Record todo = new_record(_calendar_todo._uri);
    char* text = nullptr;
    for (const Axis& axis : axes_) {
        EXPECT_EQ(axis.parse("1", todo.get()), 4);
        EXPECT_EQ(axis.parse("1", nullptr), 4);
        EXPECT_EQ(axis.parse(nullptr, event.get()), 4);
        EXPECT_EQ(axis.make(todo.get(), &text), 4);
        EXPECT_EQ(axis.make(event.get(), nullptr), 4);
        EXPECT_EQ(logged(), "");
        faults::fail("calendar_record_set_double");
        EXPECT_EQ(axis.parse("1", event.get()), 6);
        EXPECT_EQ(logged(), "_qor_calendar_parse_" + axis.name + ": set_double() fail (fffffffb)");
        faults::fail("calendar_record_get_double");
        EXPECT_EQ(axis.make(event.get(), &text), 6);
        EXPECT_EQ(logged(), "_qor_calendar_make_" + axis.name + ": get_double() fail (fffffffb)");
        EXPECT_EQ(axis.parse("1", event.get()), 0);
        faults::fail("strdup");
        EXPECT_EQ(axis.make(event.get(), &text), 6);
        EXPECT_EQ(logged(), "_qor_calendar_make_" + axis.name + ": Failed to strdup");
        EXPECT_EQ(text, nullptr);
    }
}

}  // namespace
