#pragma once

#include "host/rational.h"
#include "host/scene.h"
#include "host/session.h"
#include "host/streambuilder.h"
#include "tests/support/places.h"
#include "tests/support/reports.h"
#include "tests/support/scratchfolder.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

// A running library, in which nothing may be reported that a test doesn't expect.
class HostTest : public testing::Test {
protected:
    kfshost::Session session_;
    ReportRecorder reports_;
};

// The real files and the values computed elsewhere. A test that needs them skips where they are absent.
inline std::filesystem::path SharedData(std::string const& name)
{
    return kfstest::DataFolder() / name;
}

#define SKIP_WITHOUT_SHARED_DATA()                                                                                     \
    if (!std::filesystem::exists(SharedData("README.md")))                                                             \
        GTEST_SKIP() << "the real animation files aren't there: " << kfstest::DataFolder();

inline nlohmann::json LoadSharedJson(std::string const& name)
{
    std::ifstream file(SharedData(name));
    return nlohmann::json::parse(file);
}

// A time of the expected values: [numerator, denominator].
inline kfshost::Rational TimeOf(nlohmann::json const& pair)
{
    return {pair.at(0).get<std::int64_t>(), pair.at(1).get<std::int64_t>()};
}

// How far a time is from where a stream of that scale can be asked.
inline double RoundingOf(kfshost::Rational const& time, unsigned int scale)
{
    return std::abs((kfshost::Rational(time.ToUnits(scale), scale) - time).ToDouble());
}

inline double ReadOne(KFS_Stream const& stream, kfshost::Rational const& time, std::size_t component = 0)
{
    std::vector<double> row(static_cast<std::size_t>(stream.GetDimension()));
    kfshost::ReadAt(stream, time, row.data());
    return row[component];
}
