// Sample times of `vantish run` input: the event's time stamp is the row's
// time in nanoseconds, so the reader refuses times the 64-bit clock cannot
// hold (found by fuzzing: a negative or huge "ts" was converted regardless).
#include "host/inputs/EventInput.h"

#include <gtest/gtest.h>

#include <sstream>

namespace {

struct Read {
    std::vector<host::InputRow> rows;
    std::vector<host::InputError> errors;
};

Read readAll(const std::string& text, host::InputFormat format)
{
    std::istringstream in(text);
    host::EventReader reader(in, format, 4);
    Read r;
    while (auto row = reader.next(r.errors))
        r.rows.push_back(*row);
    return r;
}

TEST(EventInputTime, TimesOutsideTheEventClockAreRefused)
{
    const Read csv = readAll("ts,lux\n-0.5,1\n1e30,2\n2.5,3\n", host::InputFormat::Csv);
    ASSERT_EQ(csv.rows.size(), 1u);
    EXPECT_EQ(csv.rows[0].timeSeconds, 2.5);
    EXPECT_EQ(csv.rows[0].record.lux, 3.0f);
    ASSERT_EQ(csv.errors.size(), 2u);
    EXPECT_EQ(csv.errors[0].line, 2u);
    EXPECT_EQ(csv.errors[0].field, "ts");
    EXPECT_EQ(csv.errors[1].line, 3u);

    const Read json = readAll("{\"ts\": -1, \"lux\": 1}\n{\"ts\": 1.7e10, \"lux\": 2}\n{\"ts\": 2e10}\n",
                              host::InputFormat::JsonLines);
    ASSERT_EQ(json.rows.size(), 1u);
    EXPECT_EQ(json.rows[0].timeSeconds, 1.7e10);
    EXPECT_EQ(json.errors.size(), 2u);
}

} // namespace
