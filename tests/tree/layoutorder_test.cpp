#include "tree/layoutorder_private.h"

#include "tests/support/baregroup.h"
#include "tests/support/streams.h"

#include <algorithm>
#include <map>
#include <random>

namespace {

using hearth::utility::Guid;
using LayoutOrder = StreamTest;

// Bytes of which many begin alike, since no texts with such hashes are known.
Guid RandomGuid(std::mt19937& random)
{
    std::array<unsigned char, 16> bytes{};
    bytes[0] = random() % 2 == 0 ? 0x7F : 0x80;
    bytes[7] = static_cast<unsigned char>(random() % 2);
    bytes[8] = static_cast<unsigned char>(random());
    bytes[15] = static_cast<unsigned char>(random() % 3);
    return Guid(bytes);
}

KFS_MatchName NameOf(Guid const& guid)
{
    KFS_MatchName name;
    name.SetGuid(guid);
    return name;
}

// A layout of so many groups and leaves with names of their own, in no order.
class Layout {
public:
    Layout(std::size_t size, std::mt19937& random)
    {
        std::map<Guid, bool> taken;
        while (taken.size() < size) taken[RandomGuid(random)] = random() % 4 == 0;
        for (auto const& [guid, isGroup] : taken) {
            nodes_.push_back(isGroup ? std::unique_ptr<KFS_StreamBase>(new BareGroup) : MakeStream());
            nodes_.back()->SetMatchName(NameOf(guid));
        }
        std::shuffle(nodes_.begin(), nodes_.end(), random);
        for (auto const& node : nodes_) layout.push_back(node.get());
    }

    KFS_CanonicalLayout layout;

private:
    std::vector<std::unique_ptr<KFS_StreamBase>> nodes_;
};

TEST_F(LayoutOrder, KnowsWhereEachNameStands)
{
    std::mt19937 random(23);
    for (std::size_t const size : {0u, 1u, 2u, 3u, 64u, 99u, 700u}) {
        SCOPED_TRACE(size);
        Layout const made(size, random);
        KFSp_LayoutOrder const order(made.layout);
        ASSERT_EQ(size, order.Slots().size());
        EXPECT_TRUE(std::is_sorted(
            order.Slots().begin(), order.Slots().end(),
            [](KFS_StreamBase const* a, KFS_StreamBase const* b) { return a->GetMatchName() < b->GetMatchName(); }));
        std::vector<unsigned int> groups;
        for (unsigned int position = 0; position < size; ++position) {
            KFS_StreamBase const* const child = made.layout[position];
            unsigned int const slot = order.Find(child->GetMatchName());
            ASSERT_NE(KFSp_LayoutOrder::None, slot);
            EXPECT_EQ(child, order.Slots()[slot]);
            EXPECT_EQ(slot, order.SlotOf(position));
            EXPECT_EQ(position, order.PositionOf(slot));
            if (child->IsGroup()) groups.push_back(position);
        }
        EXPECT_EQ(groups, order.Subgroups());
        for (int i = 0; i < 1000; ++i) {
            KFS_MatchName const name = NameOf(RandomGuid(random));
            bool const stands = std::any_of(made.layout.begin(), made.layout.end(),
                                            [&](KFS_StreamBase const* child) { return child->GetMatchName() == name; });
            ASSERT_EQ(stands, order.Find(name) != KFSp_LayoutOrder::None);
        }
    }
}

TEST_F(LayoutOrder, NamesAreSortedByTheirBytes)
{
    std::mt19937 random(29);
    for (int i = 0; i < 10000; ++i) {
        Guid const a = RandomGuid(random);
        Guid const b = RandomGuid(random);
        ASSERT_EQ(a.GuidToBytes() < b.GuidToBytes(), a < b);
    }
}

}  // namespace
