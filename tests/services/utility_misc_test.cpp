#include "frame/services/byteorder.h"
#include "frame/services/debug.h"
#include "frame/services/scoped.h"
#include "frame/services/threads.h"

#include <gtest/gtest.h>

#include <array>
#include <climits>
#include <cstdint>
#include <cstring>
#include <list>
#include <random>
#include <set>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace {

// ---- byte order

TEST(ByteOrder, PutsTheMostSignificantByteFirstOfEveryBitPatternAtAnyAlignment)
{
    std::mt19937_64 random(1);
    alignas(8) unsigned char bytes[24];
    for (int i = 0; i < 2000; ++i) {
        std::uint64_t const bits = i % 2 ? random() : 0x7FF0000000000001u + random() % 100;  // signalling NaNs too
        unsigned char* const place = bytes + i % 8;
        std::memcpy(place, &bits, 8);
        unsigned char wanted[8];
        for (int k = 0; k < 8; ++k) wanted[k] = static_cast<unsigned char>(bits >> (56 - 8 * k));
        double number;
        std::memcpy(&number, place, 8);
        Q_FpLongSwap(&number);
        ASSERT_EQ(0, std::memcmp(wanted, &number, 8)) << std::hex << bits;
        Q_FpLongSwap(&number);
        ASSERT_EQ(0, std::memcmp(&bits, &number, 8)) << std::hex << bits;
        unsigned short const word = Q_ShortSwap(static_cast<unsigned short>(bits));
        unsigned int const longWord = Q_LongSwap(static_cast<unsigned int>(bits));
        ASSERT_EQ(0, std::memcmp(wanted + 6, &word, 2)) << std::hex << bits;
        ASSERT_EQ(0, std::memcmp(wanted + 4, &longWord, 4)) << std::hex << bits;
    }
}

// ---- pointers in 32 bits

TEST(PointerValues, AddressesComeBackAndAreTakenForNoNumber)
{
    static std::list<std::array<double, 300>> kept;  // their addresses are new also when the test is repeated
    std::array<double, 300>& objects = kept.emplace_back();
    double const& probe = kept.emplace_back()[0];
    int const next = Q_PointerToInt32(&probe) + 1;  // where the values for addresses are taken from
    Q_PointerToInt32(Q_IntPtrToPointer(next + 2));
    Q_Int32ToPointer(next + 4);
    std::vector<int> values(objects.size());
    std::set<int> different;
    std::vector<std::thread> threads;
    for (std::size_t thread = 0; thread < 3; ++thread)
        threads.emplace_back([&, thread] {
            for (std::size_t i = thread; i < objects.size(); i += 3) values[i] = Q_PointerToInt32(&objects[i]);
        });
    for (std::thread& thread : threads) thread.join();
    for (std::size_t i = 0; i < objects.size(); ++i) {
        EXPECT_EQ(&objects[i], Q_Int32ToPointer(values[i]));
        EXPECT_EQ(values[i], Q_PointerToInt32(&objects[i])) << "the same again";
        EXPECT_TRUE(different.insert(values[i]).second);
    }
    for (int const flat : {next + 2, next + 4}) {
        EXPECT_FALSE(different.contains(flat));
        EXPECT_EQ(Q_IntPtrToPointer(flat), Q_Int32ToPointer(flat));
    }
    for (int const number : {0, 1, -1, 7, INT_MAX, INT_MIN, 123456}) {
        EXPECT_EQ(number, Q_PointerToInt32(Q_IntPtrToPointer(number)));
        EXPECT_EQ(Q_IntPtrToPointer(number), Q_Int32ToPointer(number));
    }
    // A number that only turns up now, and is taken already, must not become an address.
    void* const late = Q_IntPtrToPointer(*different.begin());
    EXPECT_EQ(late, Q_Int32ToPointer(Q_PointerToInt32(late)));
}

// ---- scopes

struct Counted {
    explicit Counted(int& alive) : alive_(alive) { ++alive_; }
    Counted(Counted const&) = delete;
    virtual ~Counted() { --alive_; }
    int& alive_;
};
struct Special : Counted {
    using Counted::Counted;
};

TEST(ScAutoPtr, DeletesWhatItStillHolds)
{
    int alive = 0;
    {
        Q_ScAutoPtr<Counted> pointer(new Counted(alive));
        Counted* const taken = pointer.release();
        EXPECT_EQ(nullptr, pointer.get());
        EXPECT_EQ(1, alive);
        pointer.reset(taken);
        pointer.reset(taken);
        EXPECT_EQ(1, alive) << "resetting to the same object keeps it";
        Q_ScAutoPtr<Counted> other(Q_ScAutoPtr<Special>(new Special(alive)));
        EXPECT_EQ(2, alive);
        other = std::move(pointer);
        EXPECT_EQ(1, alive);
        EXPECT_FALSE(pointer);
        EXPECT_EQ(taken, other.get());
    }
    EXPECT_EQ(0, alive);
}

TEST(ScSetReset, WritesBackHoweverTheScopeEnds)
{
    std::string text = "first";
    std::string other = "other";
    try {
        Q_ScSetReset<std::string> scope;
        scope.Arm(&text);
        text = "changed";
        Q_ScSetReset<std::string> const inner(&text, "inner");
        EXPECT_EQ("inner", text);
        throw std::runtime_error("on the way out");
    } catch (std::runtime_error const&) {}
    EXPECT_EQ("first", text);
    {
        Q_ScSetReset<std::string> scope(&text, "second");
        scope.Arm(&other);
        EXPECT_EQ("first", text) << "a scope guards one variable at a time";
        other = "changed";
        scope.Reset();
        EXPECT_EQ("other", other);
        other = "kept";
    }
    EXPECT_EQ("kept", other) << "a scope that was reset guards nothing";
    bool flag = false;
    {
        hearth::utility::ScSetReset<bool> scope(&flag, true);
        EXPECT_TRUE(flag);
    }
    EXPECT_FALSE(flag);
}

// ---- threads

TEST(Threads, HaveNumbersOfTheirOwn)
{
    std::set<std::uint64_t> ids{hearth::threads::GetCurrentThreadID()};
    for (int i = 0; i < 20; ++i)
        std::thread([&] {
            std::uint64_t const id = hearth::threads::GetCurrentThreadID();
            EXPECT_EQ(id, hearth::threads::GetCurrentThreadID());
            EXPECT_TRUE(id != 0 && ids.insert(id).second) << "never used again, though threads come and go";
        }).join();
}

TEST(Threads, TheMainThreadLoadedTheLibraryOrWasNamed)
{
    EXPECT_TRUE(hearth::threads::CurrentThreadIsMainThread());
    std::thread([] {
        EXPECT_FALSE(hearth::threads::CurrentThreadIsMainThread());
        hearth::threads::SetCurrentThreadAsMain();
        EXPECT_TRUE(hearth::threads::CurrentThreadIsMainThread());
    }).join();
    EXPECT_FALSE(hearth::threads::CurrentThreadIsMainThread());
    hearth::threads::SetCurrentThreadAsMain();
}

TEST(Threads, ARecursiveMutexExcludesOthersUntilItsLastUnlock)
{
    hearth::threads::RecursiveMutex mutex("tests");
    int counter = 0;  // guarded by the mutex alone
    std::vector<std::thread> threads;
    for (int i = 0; i < 3; ++i)
        threads.emplace_back([&] {
            for (int k = 0; k < 2000; ++k) {
                const hearth::threads::ScRecursiveLock outer(mutex, "outer");
                mutex.Lock("inner");
                ++counter;
                mutex.Unlock();
                ++counter;
            }
        });
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(12000, counter);
}

// ---- switches

TEST(DebugDatabase, ReadsSwitchesOrTheirDefaults)
{
    hearth::debug::DebugDatabase& database = hearth::debug::DebugDatabase::Instance();
    const std::pair<char const*, int> table[] = {{"1", 1}, {"true", 1},  {"yes", 1},   {"on", 1},
                                                 {"0", 0}, {"false", 0}, {"no", 0},    {"off", 0},
                                                 {"", -1}, {"TRUE", -1}, {"maybe", -1}};
    for (auto const& [text, meaning] : table)
        for (bool const fallback : {false, true}) {
            database.SetEntry("Tests.Switch", text);
            EXPECT_EQ(meaning < 0 ? fallback : meaning == 1, database.GetEntryAs<bool>("Tests.Switch", fallback))
                << text;
            std::string value;
            EXPECT_TRUE(database.GetEntry("Tests.Switch", &value));
            EXPECT_EQ(text, value);
        }
    database.SetEntry("Tests.Switch", nullptr);
    EXPECT_FALSE(database.GetEntry("Tests.Switch", nullptr));
    EXPECT_TRUE(database.GetEntryAs<bool>("Tests.Switch", true));
    EXPECT_FALSE(database.GetEntryAs<bool>("Tests.Switch", false));
}

}  // namespace
