#include "keystore/stream.h"

#include "tests/support/listening.h"
#include "tests/support/ownedvalues.h"
#include "tests/support/streams.h"

namespace {

class Constants : public StreamTest {};

TEST_F(Constants, AFailureIsTheResultAndIsHeardAllTheSame)
{
    HeardRoot root;
    KFS_ValueDesc desc{1, 8, 42, [](KFS_Stream const*, long, int, int) { return 0; }};
    KFS_Stream stream(1, 600, 0, 0, KFS_InterpMask_Hold, 0, desc, nullptr, nullptr, false);
    long const value = 5;
    ASSERT_EQ(0, KFS_InsertKey(&stream, nullptr, 0, &value, KFS_Interp_Hold, KFS_Interp_Hold));
    ASSERT_EQ(
        0, SEQ_SetFuncs(stream.GetKeys(), 3,
                        std::array{SEQ_Funcs{nullptr, [](void*, SEQ_Head**, void*) { return 4711; }, nullptr}}.data()));
    root.Store(&stream);
    ValueListener listener;
    EXPECT_EQ(4711, stream.SetConstant(1, 0));
    EXPECT_EQ(1, listener.Take());
    EXPECT_EQ(nullptr, stream.GetKeys()) << "a list whose disposal failed is gone all the same";
    EXPECT_TRUE(stream.HasKeys());
}

TEST_F(Constants, AFailureOnTheWayToKeysLeavesTheConstant)
{
    for (short const dimension : {1, 40}) {  // the wide record needs room to be put aside
        auto const make = [dimension] {
            auto stream = std::make_unique<TestStream>(StreamOptions{.dimension = dimension, .noKeys = true});
            stream->Key(70, std::vector<double>(40, 4.0));
            return stream;
        };
        int failures = 0;
        auto const check = [&](TestStream const& stream, int code, Q_MemoryCount const& before) {
            EXPECT_EQ(4.0, stream.At1(0));
            if (code != 0) {  // the packed times are done without
                EXPECT_TRUE(stream->HasNoKeys());
                EXPECT_EQ(nullptr, stream->GetKeys());
                EXPECT_EQ(before.blocks, Q_MemoryLive(nullptr).blocks);
                ++failures;
            }
        };
        FailEveryAllocation(
            make, [](TestStream& stream) { return stream->SetConstant(0, 1); }, check);
        EXPECT_LE(2, failures);
    }
    OwnedValues::Scope const owned;
    auto const stream = OwnedValues::MakeStream(true);
    OwnedValues::InsertKey(stream.get(), 0, 5.0);
    OwnedValues::copyCode = 9001;
    EXPECT_EQ(9001, stream->SetConstant(0, 1));
    OwnedValues::copyCode = 0;
    EXPECT_TRUE(stream->HasNoKeys());
    EXPECT_EQ(1, OwnedValues::Live());
    EXPECT_EQ(0, stream->SetConstant(0, 1));
    EXPECT_EQ(1, OwnedValues::Live());
    EXPECT_EQ(5.0, OwnedValues::RemoveKey(stream.get(), 0));
}

TEST_F(Constants, WhatShouldNotBeAnimatedIsReportedAndAnimated)
{
    TestStream const still({.noKeys = true, .interpMask = 0});
    EXPECT_EQ(0, still->SetConstant(0, 0));
    EXPECT_REPORT(reports, 10, "attempt to animate a non-animatable stream");
    EXPECT_TRUE(still->HasKeys());
    TestStream const canonical({.noKeys = true});
    canonical->SetCanonical(true);
    EXPECT_EQ(0, canonical->SetConstant(0, 0));
    EXPECT_REPORT(reports, 10, "attempt to animate the canonical instance stream");
    EXPECT_TRUE(canonical->HasKeys());
    EXPECT_EQ(0, canonical->SetConstant(1, 0));
    EXPECT_NO_REPORT(reports);
}

}  // namespace
