#include "keystore/keytimes.h"

#include "keystore/keylist_private.h"
#include "tests/support/streams.h"

#include <algorithm>
#include <climits>
#include <random>

namespace {

class KeyTimes : public StreamTest {};

// Whatever order keys come and go in, a search answers like a search of a sorted vector.
TEST_F(KeyTimes, SearchesAgreeWithASortedVectorThroughEdits)
{
    std::mt19937 random(7);
    TestStream stream;
    std::vector<int> model;
    for (int step = 0; step < 400; ++step) {
        const int time = static_cast<int>(random() % 300) - 150;
        const auto at = std::lower_bound(model.begin(), model.end(), time);
        const bool stands = at != model.end() && *at == time;
        if (stands && random() % 2) {
            ASSERT_EQ(0, KFS_RemoveKey(stream, static_cast<int>(at - model.begin()), nullptr));
            model.erase(at);
        } else if (!stands) {
            stream.Key(time, {1.0 * time});
            model.insert(at, time);
        }
        const int asked = static_cast<int>(random() % 320) - 160;
        const auto expected = std::lower_bound(model.begin(), model.end(), asked);
        bool found = false;
        int index = -7;
        ASSERT_EQ(0, KFSp_SearchKeys(stream->GetKeyData(), asked, &found, &index));
        ASSERT_EQ(expected - model.begin(), index) << "step " << step << " asked " << asked;
        ASSERT_EQ(expected != model.end() && *expected == asked, found);
    }
    EXPECT_EQ(model, stream.Times());
}

TEST_F(KeyTimes, NeverDecidesAResult)
{
    TestStream stream;
    stream.Key(10, {1.0}).Key(20, {3.0}).Key(30, {5.0});
    stream->GetKeyData()->times.Drop();
    Q_FailAllocation(1);
    EXPECT_DOUBLE_EQ(2.0, stream.At1(15));
    Q_FailAllocation(0);
    // Whoever retimes keys through the list's handle says so, and is believed.
    stream.Record(1)->time = 26;
    stream->SetKeys(stream->GetKeys());
    EXPECT_DOUBLE_EQ(2.0, stream.At1(18));
}

TEST_F(KeyTimes, OrderIsByTheDifferenceWithWrapAround)
{
    TestStream stream;
    stream.Key(INT_MAX - 10, {1.0}).Key(INT_MAX - 5, {2.0});
    bool found = false;
    int index = 0;
    ASSERT_EQ(0, KFSp_SearchKeys(stream->GetKeyData(), INT_MIN + 5, &found, &index));
    EXPECT_EQ(2, index) << "just past the end of the numbers is later";
    int viaList = 0;
    KFS_KeyScalar probe{};
    probe.time = INT_MIN + 5;
    unsigned char foundByte = 1;
    ASSERT_EQ(0, SEQ_GetSortedConstItem(stream->GetKeys(), 0, &probe, &foundByte, 0, &viaList));
    EXPECT_EQ(index, viaList);
}

}  // namespace
