#include "tests/support/chunklines.h"
#include "tests/support/groups.h"

namespace {

using NoFactory = StreamTest;

// A host may put a stream into a list that it has made without a factory. Like one of a kind that nobody has registered,
// it is written without its name.
TEST_F(NoFactory, AStreamInAListIsWrittenWithoutItsName)
{
    TestKinds kinds;
    kinds.Leaf("item", 1, 0.0);
    kinds.Indexed("list", {Name("item")});
    std::unique_ptr<KFS_StreamBase> const list(
        Get_VX_StreamFactory()->CreateStream(Name("list"), true, 600, true, false));
    for (KFS_StreamFactory* const factory : {Get_VX_StreamFactory(), static_cast<KFS_StreamFactory*>(nullptr)}) {
        auto leaf = std::make_unique<TestLeaf>(Name("item"), factory, true, 600U, false, short{1}, 0.0);
        leaf->SetDisplayName(Q_AsciiToUTF16String("mine"));
        Q_ScAutoPtr<KFS_StreamBase> stream(leaf.release());
        list->GetAsIndexedGroup()->AppendStream(&stream);
    }
    MemoryFile const file([&](CKF_File* into) { list->Write(into); });
    std::vector<std::string> names;
    for (std::string const& line : file.Lines())
        if (line.starts_with("    kfsn")) names.push_back(line.substr(9));
    auto const hex = [](std::string const& text) {
        return MemoryFile::Hex({reinterpret_cast<unsigned char const*>(text.data()), text.size()});
    };
    EXPECT_EQ((std::vector<std::string>{hex("mine"), hex("-_0_/-")}), names);
}

}  // namespace
