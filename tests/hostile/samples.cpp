#include "tests/hostile/samples.h"

#include "frame/services/chunkfile.h"
#include "fuzz/treekinds.h"
#include "host/dimensions.h"
#include "host/paths.h"
#include "keystore/edit.h"
#include "overrides/streamexpression.h"

#include <gtest/gtest.h>

#include <functional>

using kfshost::Scene;
using kfshost::StreamItem;
using kfshost::StreamKind;

namespace {

// ---- projects

StreamItem Item(std::string const& node, StreamKind kind, int dimension, int keys, KFS_Interp interp)
{
    StreamItem item;
    item.animation = "walk";
    item.node = node;
    item.kind = kind;
    item.path = kfshost::PathOf(item);
    item.components = kfshost::UsualComponents(kind, static_cast<std::size_t>(dimension));
    kfshost::StreamBuilder builder(dimension, 24, item.path);
    std::vector<double> const third(static_cast<std::size_t>(dimension), 1.0 / 3.0);
    for (int i = 0; i < keys; ++i) {
        std::vector<double> value;
        for (int j = 0; j < dimension; ++j) value.push_back(i * 7 % 5 + 0.5 * j);
        builder.Append(i * 12, value.data(), interp, interp);
        if (interp == KFS_Interp_Spline)
            builder.SetHandles(i, {value.data(), third.data(), value.data(), third.data()});
    }
    item.stream = builder.Take();
    return item;
}

std::string Saved(std::vector<StreamItem> items, std::function<void(kfshost::SceneGroup&)> const& edit = {})
{
    Scene scene;
    scene.name = "sample";
    scene.timeScale = 24;
    scene.streams = std::move(items);
    auto const tree = kfshost::MakeTree(std::move(scene));
    if (edit) edit(*tree);
    std::vector<unsigned char> const bytes = kfshost::SaveProjectToMemory(*tree, "sample");
    return {bytes.begin(), bytes.end()};
}

std::string SavedOne(StreamItem item)
{
    std::vector<StreamItem> items;
    items.push_back(std::move(item));
    return Saved(std::move(items));
}

StreamItem Path(int keys, bool floats)
{
    StreamItem item = Item("ball", StreamKind::Translation, floats ? 2 : 3, keys, KFS_Interp_Linear);
    item.stream = kfshost::MakePath(item);
    if (floats) kfshost::LetInnerKeysFloat(*item.stream);
    return item;
}

std::string Constant()
{
    StreamItem item = Item("ball", StreamKind::Scale, 3, 1, KFS_Interp_Hold);
    EXPECT_EQ(0, item.stream->SetConstant(1, 0));
    return SavedOne(std::move(item));
}

std::string WithExpression()
{
    StreamItem item = Item("ball", StreamKind::Weights, 1, 2, KFS_Interp_Linear);
    static_cast<void>(KFS_SetStreamExpression(item.stream.get(), Q_AsciiToUTF16String("time * 2")));
    return SavedOne(std::move(item));
}

// Older files have the text in a chunk of another name.
std::string WithOldExpression()
{
    std::string bytes = WithExpression();
    bytes.replace(bytes.find("Utf8"), 4, "expr");
    return bytes;
}

// Each component with keys of its own.
std::string Separated()
{
    std::vector<StreamItem> items;
    items.push_back(Item("ball", StreamKind::Translation, 3, 2, KFS_Interp_Spline));
    return Saved(std::move(items), [](kfshost::SceneGroup& tree) {
        KFS_StreamGroup& node = *tree.GetEditableStream(0U)->GetAsGroup()->GetEditableStream(0U)->GetAsGroup();
        KFS_Stream& leader = *node.GetEditableStream(0U)->GetAsLeaf();
        kfshost::SeparateDimensions(leader);
        T_Time const at{5, 24};
        static_cast<void>(KFS_InsertKeyF(leader.GetSeparationFollower(1), &at, 0, nullptr, 0, 0));
    });
}

std::string WithManyNodes()
{
    std::vector<StreamItem> items;
    for (char const* const node : {"a", "a", "\xC3\xA4", ""}) {
        items.push_back(Item(node, StreamKind::Weights, 2, 1, KFS_Interp_Linear));
        items.push_back(Item(node, StreamKind::Angles, 1, 0, KFS_Interp_Linear));
    }
    return Saved(std::move(items), [](kfshost::SceneGroup& tree) {
        tree.AppendAnimation("empty");
        tree.AppendAnimation("still").AppendNode("").SetHidden(true);
    });
}

// The same file as one of an older version, which lacks what came later.
std::string OfVersion(unsigned char major, std::string bytes)
{
    constexpr std::size_t lowByteOfMajor = 23;
    bytes[lowByteOfMajor] = static_cast<char>(major);
    return bytes;
}

// ---- groups

// Everything once, with a key or a name of its own.
std::string TreeOfAllKinds()
{
    auto const root = fuzzkinds::TreeKinds::MakeRoot();
    KFS_StreamGroup& group = *root->GetAsGroup();
    KFS_IndexedStreamGroup& list = *group.GetEditableStream(0U)->GetAsIndexedGroup();
    for (char const* const kind : {"effect", "path", "layer", "kept"}) {
        Q_ScAutoPtr<KFS_StreamBase> child(fuzzkinds::TreeKinds::Make(kind).release());
        list.GetEditableStream(list.AppendStream(&child))->SetDisplayName(Q_AsciiToUTF16String("my own"));
    }
    KFS_StreamGroup& effect = *group.GetEditableStream(1U)->GetAsGroup();
    for (unsigned int i = 0; i < effect.GetNumStreams(); ++i) effect.GetEditableStream(i);
    KFS_Stream& path = *group.GetEditableStream(2U)->GetAsLeaf();
    static_cast<void>(path.SetConstant(0, 0));
    for (int i = 0; i < 3; ++i) {
        T_Time const at{i * 100, 600};
        double const place[3] = {1.0 * i, i % 2 * 1.0, 0.0};
        static_cast<void>(KFS_InsertKeyF(&path, &at, 1, place, KFS_Interp_Spline, KFS_Interp_Linear));
    }
    CKF_File file;
    static_cast<void>(file.CreateInMemory());
    root->Write(&file);
    static_cast<void>(file.Commit());
    return {file.GetBytes().begin(), file.GetBytes().end()};
}

// ---- imports

constexpr char const* Motion = "HIERARCHY\n"
                               "ROOT Hips\n"
                               "{\n"
                               "  OFFSET 0 0 0\n"
                               "  CHANNELS 4 Xposition Yposition Zposition Zrotation\n"
                               "  JOINT Leg\n"
                               "  {\n"
                               "    OFFSET 1.5 -2 +3e-1\n"
                               "    CHANNELS 1 Xrotation\n"
                               "    End Site\n"
                               "    {\n"
                               "      OFFSET 0 -1 0\n"
                               "    }\n"
                               "  }\n"
                               "}\n"
                               "MOTION\n"
                               "Frames: 2\n"
                               "Frame Time: 0.04\n"
                               "0 1 -2 .3e1 4\n"
                               "10 11 12 13 14\n";

GltfFile Splines()
{
    GltfFile file;
    file.data.clear();
    file.Add({0.0F, 0.5F, 1.0F});
    file.Add(std::vector<float>(27, 0.25F));
    file.document["animations"][0]["samplers"][0]["interpolation"] = "CUBICSPLINE";
    file.document["accessors"][1]["count"] = 9;
    file.document["bufferViews"][1]["byteLength"] = 108;
    file.document["buffers"][0]["byteLength"] = 120;
    return file;
}

}  // namespace

std::vector<Sample> ProjectSamples()
{
    std::string const spline = SavedOne(Item("ball", StreamKind::Rotation, 4, 2, KFS_Interp_Spline));
    return {{"empty", Saved({})},
            {"linear", SavedOne(Item("ball", StreamKind::Translation, 3, 2, KFS_Interp_Linear))},
            {"hold", SavedOne(Item("ball", StreamKind::Weights, 1, 3, KFS_Interp_Hold))},
            {"spline", spline},
            {"path", SavedOne(Path(3, false))},
            {"float_keys", SavedOne(Path(5, true))},
            {"constant", Constant()},
            {"separated", Separated()},
            {"expression", WithExpression()},
            {"expression_71", OfVersion(71, WithOldExpression())},
            {"many_nodes", WithManyNodes()},
            {"version_55", OfVersion(55, Saved({}))},
            {"version_60", OfVersion(60, spline)},
            {"version_81", OfVersion(81, spline)}};
}

std::vector<Sample> TreeSamples()
{
    return {{"all_kinds", TreeOfAllKinds()}};
}

std::vector<Sample> GltfSamples()
{
    GltfFile hold;
    hold.document["animations"][0]["samplers"][0]["interpolation"] = "STEP";
    return {{"linear.gltf", GltfFile().Text()},
            {"linear.glb", GltfFile().Binary()},
            {"hold.glb", hold.Binary()},
            {"spline.glb", Splines().Binary()}};
}

std::vector<Sample> BvhSamples()
{
    return {{"walk.bvh", Motion}};
}
