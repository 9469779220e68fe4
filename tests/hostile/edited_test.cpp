#include "host/dimensions.h"
#include "host/paths.h"
#include "host/projectfile.h"
#include "host/session.h"
#include "host/streambuilder.h"
#include "keystore/attributes.h"
#include "keystore/edit.h"
#include "tests/hostile/samples.h"
#include "tests/support/reports.h"

#include <gtest/gtest.h>

#include <functional>
#include <limits>

// Projects that a host has edited through the tree: what is saved can be loaded, and what couldn't be loaded isn't saved
// in the place of what could.

using kfshost::NodeGroup;
using kfshost::SceneGroup;
using kfshost::StreamKind;

namespace {

struct Edit {
    char const* what;
    std::function<void(NodeGroup&, KFS_Stream&)> make;  // gets a node and its translation, three components with keys
    char const* refusal = "";
};

void SetNumbers(KFS_Stream& stream, int index, double number)
{
    std::vector<double> const numbers(static_cast<std::size_t>(stream.GetDimension()), number);
    EXPECT_EQ(0, KFS_SetKeyF(&stream, index, numbers.data(), KFS_Interp_Linear, KFS_Interp_Linear));
}

void RemoveKeys(KFS_Stream& stream)
{
    while (stream.GetKeyCount() > 0) ASSERT_EQ(0, KFS_RemoveKey(&stream, 0, nullptr));
}

std::unique_ptr<KFS_Stream> EndlessPath()
{
    kfshost::StreamBuilder builder(2, 24, "endless", kfshost::StreamForm::Path);
    for (int i = 0; i < 3; ++i) {
        double const place[2] = {1.0 * i, 0.0};
        builder.Append(i * 10, place, KFS_Interp_Linear, KFS_Interp_Linear);
    }
    auto path = builder.Take();
    kfshost::LetInnerKeysFloat(*path);
    SetNumbers(*path, 0, -1e308);
    SetNumbers(*path, 2, 1e308);
    return path;
}

constexpr unsigned int ScaleSlot = 5;

Edit const Edits[] = {
    {"a leaf that nobody described", [](NodeGroup& node, KFS_Stream&) { node.GetEditableStream(ScaleSlot); }},
    {"components without names",
     [](NodeGroup& node, KFS_Stream&) {
         node.SetFacts(StreamKind::Translation, {kfshost::SourceInterpolation::Linear, {"", "", "z"}});
     }},
    {"a component's name in two lines",
     [](NodeGroup& node, KFS_Stream&) {
         node.SetFacts(StreamKind::Translation, {kfshost::SourceInterpolation::Linear, {"x", "y\nz", "w"}});
     }},
    {"too many components",
     [](NodeGroup& node, KFS_Stream&) {
         node.SetFacts(StreamKind::Translation, {kfshost::SourceInterpolation::Linear, {"x", "y", "z", "w"}});
     }},
    {"no key is left", [](NodeGroup&, KFS_Stream& stream) { RemoveKeys(stream); }},
    {"a constant", [](NodeGroup&, KFS_Stream& stream) { EXPECT_EQ(0, stream.SetConstant(1, 0)); }},
    {"a path that is too long to be measured, and a key that floats on it",
     [](NodeGroup& node, KFS_Stream&) {
         node.TakeChannel(StreamKind::Translation);
         node.PutChannel(StreamKind::Translation, EndlessPath());
     }},
    {"a key that isn't finite",
     [](NodeGroup&, KFS_Stream& stream) { SetNumbers(stream, 1, std::numeric_limits<double>::infinity()); },
     "saved: can't be saved: walk/ball/translation has a key without a finite value"},
    {"another scale", [](NodeGroup&, KFS_Stream& stream) { EXPECT_EQ(0, KFS_RescaleStream(&stream, 600)); },
     "saved: can't be saved: walk/ball/translation isn't in the times of its scene"},
    {"separated dimensions",
     [](NodeGroup&, KFS_Stream& stream) { EXPECT_FALSE(kfshost::SeparateDimensions(stream).IsOff()); }},
    {"a dimension that isn't finite",
     [](NodeGroup&, KFS_Stream& stream) {
         kfshost::SeparateDimensions(stream);
         SetNumbers(*stream.GetSeparationFollower(2), 0, std::numeric_limits<double>::quiet_NaN());
     },
     "saved: can't be saved: walk/ball/translation has a key without a finite value"},
    {"a separated scale",
     [](NodeGroup& node, KFS_Stream&) { node.GetEditableStream(ScaleSlot)->SetDimensionsSeparated(true); },
     "saved: can't be saved: walk/ball/scale is separated, which it can't be"},
    {"nothing to stand at",
     [](NodeGroup&, KFS_Stream& stream) {
         RemoveKeys(stream);
         EXPECT_EQ(0, KFS_SetStreamIMask(&stream, 0));
     },
     "saved: can't be saved: walk/ball/translation may not move, and has no value to stand at"},
};

TEST(EditedProject, IsSavedAsWhatCanBeLoaded)
{
    kfshost::Session const session;
    ReportRecorder reports;
    std::string const linear = Samples("project").at("linear");
    for (Edit const& edit : Edits) {
        SCOPED_TRACE(edit.what);
        auto const tree =
            kfshost::LoadProjectFromMemory(std::vector<unsigned char>(linear.begin(), linear.end()), "sample");
        auto& node = dynamic_cast<NodeGroup&>(*tree->GetEditableStream(0U)->GetAsGroup()->GetEditableStream(0U));
        edit.make(node, *node.GetEditableStream(0U)->GetAsLeaf());
        std::string refusal;
        try {
            auto const first = kfshost::SaveProjectToMemory(*tree, "saved");
            auto const again = kfshost::LoadProjectFromMemory(first, "loaded");
            EXPECT_EQ(first, kfshost::SaveProjectToMemory(*again, "saved again"));
        } catch (kfshost::ProjectError const& error) {
            refusal = error.what();
        }
        EXPECT_EQ(edit.refusal, refusal);
    }
    reports.Take();
}

}  // namespace
