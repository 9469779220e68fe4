#include "keystore/stream.h"

#include "tests/support/streams.h"

#include <algorithm>
#include <random>

namespace {

using Range = std::array<int, 2>;
constexpr int None = KFS_INVALID_INDEX;

class StaleRanges : public StreamTest {
protected:
    static std::unique_ptr<TestStream> WithKeys(int count, bool spatial = false)
    {
        auto stream = std::make_unique<TestStream>(StreamOptions{.dimension = 2, .spatial = spatial});
        for (int i = 0; i < count; ++i) stream->Key(10 * i, {1.0 * i, 2.0 * i});
        EXPECT_EQ(0, (*stream)->UpdateStream());
        return stream;
    }
    static void Clean(TestStream const& stream)
    {
        for (int* const range : {stream->GetInvalidKeyIndexForModify(), stream->GetArcInvalidKeyIndexForModify()}) {
            range[0] = None;
            range[1] = None;
        }
    }
};

TEST_F(StaleRanges, ARenderMarksItsOwnKeys)
{
    auto const stream = WithKeys(4);
    {
        Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
        EXPECT_EQ(0, (*stream)->SetInvalid(2, 1));
        EXPECT_EQ(0, (*stream)->SetArcInvalid(2, 1));
        EXPECT_EQ((Range{1, 2}), stream->Stale());
    }
    EXPECT_EQ(TestStream::NotStale, stream->Stale());
    EXPECT_EQ(TestStream::NotStale, stream->ArcStale());
}

}  // namespace
