#include "host/import.h"
#include "host/import_error.h"
#include "tests/host/gltf_files.h"
#include "tests/host/hosttest.h"

#include <cmath>
#include <limits>
#include <numeric>
#include <sstream>
#include <tuple>
#include <utility>

using kfshost::Rational;
using nlohmann::json;

namespace {

class GltfInput : public HostTest {
protected:
    // What an import of these bytes says; "" when it succeeds.
    std::string ErrorOf(std::string const& name, std::string const& bytes)
    {
        return ErrorOfFile(folder_.Write(name, bytes));
    }

    std::string ErrorOfFile(std::string const& fileName)
    {
        try {
            kfshost::ImportFile(fileName);
        } catch (kfshost::ImportError const& error) {
            return error.what();
        }
        return "";
    }

    kfshost::Scene Import(GltfFile const& file) { return kfshost::ImportFile(folder_.Write("file.gltf", file.Text())); }

    ScratchFolder folder_;
};

std::vector<double> Values(kfshost::Scene const& scene, Rational const& time)
{
    std::vector<double> row(scene.streams.at(0).components.size());
    kfshost::ReadAt(*scene.streams.at(0).stream, time, row.data());
    return row;
}

}  // namespace

// Three ways to carry the same data.
TEST_F(GltfInput, DataIsReadFromWhereverItLies)
{
    GltfFile file;
    std::vector<double> const halfway{2.5, 3.5, 4.5};
    EXPECT_EQ(halfway, Values(Import(file), Rational(1, 4)));
    EXPECT_EQ(halfway, Values(kfshost::ImportFile(folder_.Write("file.glb", file.Binary())), Rational(1, 4)));
    folder_.Write("deeper/some data.bin", file.data + "and more");
    file.document["buffers"][0]["uri"] = "deeper/some%20data.bin";
    EXPECT_EQ(halfway, Values(Import(file), Rational(1, 4)));
}

TEST_F(GltfInput, NamesMakePathsOfWhichNoTwoAreAlike)
{
    GltfFile file;
    json& animation = file.document["animations"][0];
    animation["channels"].push_back(animation["channels"][0]);
    animation["name"] = "up\nand down";
    file.document["nodes"][0].erase("name");
    auto const scene = Import(file);
    ASSERT_EQ(2U, scene.streams.size());
    EXPECT_EQ("file", scene.name);
    EXPECT_EQ(R"(up\nand down/node0/translation)", scene.streams[0].path);
    EXPECT_EQ(R"(up\nand down/node0/translation#2)", scene.streams[1].path);
    EXPECT_EQ("animations[0].channels[1]", scene.streams[1].place);
}

TEST_F(GltfInput, StridesAndOffsetsAreFollowed)
{
    GltfFile file;
    file.data.clear();
    file.Add({99, 0.0F, 1, 2, 3, 0.5F, 4, 5, 6, 1.0F, 7, 8, 9});
    file.document["buffers"][0]["byteLength"] = 52;
    file.document["bufferViews"] = {{{"buffer", 0}, {"byteOffset", 4}, {"byteLength", 48}, {"byteStride", 16}}};
    file.document["accessors"][1]["bufferView"] = 0;
    file.document["accessors"][1]["byteOffset"] = 4;
    EXPECT_EQ((std::vector<double>{2.5, 3.5, 4.5}), Values(Import(file), Rational(1, 4)));
}

TEST_F(GltfInput, NormalizedIntegersBecomeFractions)
{
    std::tuple<int, std::string, std::vector<double>> const rows[] = {
        // the bytes of one quaternion
        {5120, {"\x7F\x81\x80\x01", 4}, {1.0, -1.0, -1.0, 1.0 / 127}},
        {5121, {"\xFF\x00\x01\x80", 4}, {1.0, 0.0, 1.0 / 255, 128.0 / 255}},
        {5122, {"\xFF\x7F\x01\x80\x00\x80\x01\x00", 8}, {1.0, -1.0, -1.0, 1.0 / 32767}},
        {5123, {"\xFF\xFF\x00\x00\x01\x00\x00\x80", 8}, {1.0, 0.0, 1.0 / 65535, 32768.0 / 65535}},
    };
    for (auto const& [type, bytes, values] : rows) {
        GltfFile file;
        file.data.resize(12);
        for (int key = 0; key < 3; ++key) file.data += bytes;
        file.document["buffers"][0]["byteLength"] = file.data.size();
        file.document["bufferViews"][1]["byteLength"] = file.data.size() - 12;
        file.document["accessors"][1].update({{"componentType", type}, {"normalized", true}, {"type", "VEC4"}});
        file.document["animations"][0]["channels"][0]["target"]["path"] = "rotation";
        EXPECT_EQ(values, Values(Import(file), Rational(1, 2))) << type;
    }
}

TEST_F(GltfInput, SparseAccessorsReplaceElements)
{
    GltfFile file;
    file.data += std::string("\x02\x00\x00\x00", 4);
    file.Add({70, 80, 90});
    file.document["buffers"][0]["byteLength"] = file.data.size();
    file.document["bufferViews"].push_back({{"buffer", 0}, {"byteOffset", 48}, {"byteLength", 4}});
    file.document["bufferViews"].push_back({{"buffer", 0}, {"byteOffset", 52}, {"byteLength", 12}});
    json& accessor = file.document["accessors"][1];
    accessor["sparse"] = {
        {"count", 1}, {"indices", {{"bufferView", 2}, {"componentType", 5121}}}, {"values", {{"bufferView", 3}}}};
    EXPECT_EQ((std::vector<double>{70, 80, 90}), Values(Import(file), Rational(1, 1)));
    EXPECT_EQ((std::vector<double>{4, 5, 6}), Values(Import(file), Rational(1, 2)));
    accessor.erase("bufferView");  // then the others are zero
    EXPECT_EQ((std::vector<double>{70, 80, 90}), Values(Import(file), Rational(1, 1)));
    EXPECT_EQ((std::vector<double>{0, 0, 0}), Values(Import(file), Rational(1, 2)));
}

// One thing of a good file replaced or added, and the whole line that says what is wrong with it. What has nothing to do
// with keys can be as wrong or as unknown as it likes.
constexpr char const* Replaced = R"(
/asset 7 | asset: isn't an object
/extensionsRequired ["EXT_meshopt_compression"] | extensionsRequired: needs EXT_meshopt_compression, which isn't supported
/accessors/0/count 1000000 | accessors[0]: says it has 1000000 elements, more than its bufferView of 12 bytes holds
/accessors/0/byteOffset 12 | accessors[0]: says it has 3 elements, more than its bufferView of 12 bytes holds
/accessors/0/count 0 | animations[0].samplers[0]: has 3 values for 0 times
/accessors/0/count -3 | accessors[0].count: isn't a whole number from 0 to 1099511627776
/accessors/0/bufferView 2 | accessors[0]: asks for bufferView 2 of 2
/accessors/0/bufferView "0" | accessors[0].bufferView: isn't a whole number from 0 to 2147483647
/accessors/0/type "VEC2" | accessors[0]: isn't of type SCALAR
/accessors/0/componentType 5125 | accessors[0]: has components of type 5125, which animation can't have
/accessors/1/componentType 5122 | accessors[1]: has integers that aren't normalized
/accessors/1/type "VEC4" | accessors[1]: isn't of type VEC3
/accessors/1/count 2 | animations[0].samplers[0]: has 2 values for 3 times
/bufferViews/1/byteLength 40 | bufferViews[1]: reaches beyond its buffer of 48 bytes
/bufferViews/1/byteOffset 1099511627776 | bufferViews[1]: reaches beyond its buffer of 48 bytes
/bufferViews/1/byteStride 8 | bufferViews[1]: has a byteStride smaller than an element
/bufferViews/1/buffer 1 | bufferViews[1]: asks for buffer 1 of 1
/buffers/0/byteLength 100 | buffers[0]: has 48 bytes of its 100
/buffers/0/byteLength 0 | buffers[0]: has no bytes
/buffers/0/uri "gone.bin" | buffers[0]: can't be opened: No such file or directory
/buffers/0/uri "../file.gltf" | buffers[0]: "../file.gltf" isn't a file in this file's folder
/buffers/0/uri "a/%2e%2e/%2E%2E/b" | buffers[0]: "a/../../b" isn't a file in this file's folder
/buffers/0/uri "/etc/hostname" | buffers[0]: "/etc/hostname" isn't a file in this file's folder
/buffers/0/uri "http://localhost/a" | buffers[0]: "http://localhost/a" isn't a file in this file's folder
/buffers/0/uri "data:text/plain,abc" | buffers[0]: has embedded data that isn't base64
/buffers/0/uri "" | buffers[0]: has no uri
/animations/0/samplers/0/interpolation "SMOOTH" | animations[0].samplers[0]: has the interpolation "SMOOTH"
/animations/0/samplers/0/interpolation "CUBICSPLINE" | animations[0].samplers[0]: has 3 values for 3 times
/animations/0/samplers/0/input 2 | animations[0].samplers[0]: asks for accessor 2 of 2
/animations/0/samplers/0/output 2 | animations[0].samplers[0]: asks for accessor 2 of 2
/animations/0/samplers/0 {} | animations[0].samplers[0].input: is missing
/animations/0/channels/0/sampler 1 | animations[0].channels[0]: asks for sampler 1 of 1
/animations/0/channels/0/target/node 1 | animations[0].channels[0]: asks for node 1 of 1
/animations/0/channels/0/target {} | animations[0].channels[0].target.path: is missing
/animations/0/channels 5 | animations[0].channels: isn't a list
/accessors/0 {"componentType": 5126, "count": 1000000000, "type": "SCALAR"} | accessors[0]: has 1000000000 elements and no data for them
/accessors/1/sparse {"count": 4, "indices": {"bufferView": 0, "componentType": 5121}, "values": {"bufferView": 1}} | accessors[1]: replaces 4 elements of 3
/accessors/1/sparse {"count": 1, "indices": {"bufferView": 0, "componentType": 5121, "byteOffset": 7}, "values": {"bufferView": 1}} | accessors[1]: replaces element 63 of 3
/accessors/1/sparse {"count": 1, "indices": {"bufferView": 0, "componentType": 5126}, "values": {"bufferView": 1}} | accessors[1]: has sparse indices of type 5126
/accessors/1/sparse {"count": 1, "indices": {"bufferView": 0, "componentType": 5121}, "values": 5} | accessors[1].sparse.values: isn't an object
/images [{"uri": "gone.png"}, {"bufferView": 77}, 5] | fine
/materials "none" | fine
/meshes [{"primitives": -3}] | fine
/extensionsRequired ["KHR_materials_unlit", "KHR_draco_mesh_compression"] | fine
/animations/0/channels/- {"sampler": 9, "target": {"path": "translation"}} | fine
/animations/0/channels/- {"sampler": 9, "target": {"node": 0, "path": "pointer"}} | fine
)";

TEST_F(GltfInput, SaysWhatIsWrongAndWhere)
{
    std::istringstream rows(Replaced);
    int count = 0;
    for (std::string row; std::getline(rows, row); ++count) {
        if (row.empty()) continue;
        std::size_t const blank = row.find(' '), bar = row.find(" | ");
        GltfFile file;
        file.document[json::json_pointer(row.substr(0, blank))] = json::parse(row.substr(blank, bar - blank));
        std::string const error = ErrorOf("file.gltf", file.Text());
        EXPECT_EQ(row.substr(bar + 3), error.empty() ? "fine" : error);
    }
    EXPECT_GT(count, 45);
    constexpr float nan = std::numeric_limits<float>::quiet_NaN(), infinity = std::numeric_limits<float>::infinity();
    using Row = std::tuple<std::size_t, std::vector<float>, char const*>;  // floats from a byte on
    for (auto const& [offset, numbers, error] :
         {Row{4, {nan}, "accessors[0]: element 1 isn't a finite number"},
          {4, {infinity}, "accessors[0]: element 1 isn't a finite number"},
          {20, {nan}, "accessors[1]: element 0 isn't a finite number"},
          {4, {0.0F}, "accessors[0]: time 1 isn't later than the one before it"},
          {4, {2.0F}, "accessors[0]: time 2 isn't later than the one before it"},
          {4, {1e9F, 3e9F}, "key times: a time that is too long for a 32-bit time line"}}) {
        GltfFile file;
        file.Put(offset, numbers);
        EXPECT_EQ(error, ErrorOf("file.gltf", file.Text()));
    }
}

TEST_F(GltfInput, SaysWhatIsWrongWithTheContainerAndTheText)
{
    std::string const good = GltfFile().Binary(), size = std::to_string(good.size());
    std::size_t const jsonLength = (GltfFile().document.dump().size() + 3) / 4 * 4;
    auto const with = [&](std::size_t offset, std::string const& bytes) {
        return std::string(good).replace(offset, bytes.size(), bytes);
    };
    auto const word = GltfFile::Word;
    std::pair<std::string, std::string> const binaries[] = {
        {"", "header: this isn't a binary glTF file"},
        {good.substr(0, 8), "header: the file ends after 8 bytes"},
        {with(4, word(1)), "header: is of version 1; version 2 is supported"},
        {good.substr(0, good.size() - 1),
         "header: the file has " + std::to_string(good.size() - 1) + " bytes and says " + size},
        {with(16, "NOSJ"), "JSON chunk: is of another type than it must be"},
        {with(12, word(0xFFFFFFFF)),
         "JSON chunk: the file has " + std::to_string(good.size() - 20) + " of the chunk's 4294967295 bytes"},
        {with(20 + jsonLength, word(49)), "BIN chunk: the file has 48 of the chunk's 49 bytes"},
        {with(8, word(20 + jsonLength)).substr(0, 20 + jsonLength), "buffers[0]: has 0 bytes of its 48"}};
    for (auto const& [bytes, error] : binaries) EXPECT_EQ(error, ErrorOf("a.glb", bytes));
    std::pair<std::string, char const*> const texts[] = {
        {"{\n  oops}", "line 2, column 3: this isn't JSON"},
        {std::string(100000, '['), "the JSON is nested more than 64 deep"},
        {"{\"asset\":1e999}", "the JSON has a number that is out of range"},
        {"[]", "isn't an object"},
        {"{\"a\": [1, -Infinity]}", "line 1, column 12: \"-Infinity\" isn't a number that JSON has"}};
    for (auto const& [text, error] : texts) EXPECT_EQ(error, ErrorOf("a.gltf", text));
    folder_.Write("folder.gltf/inside", "");
    EXPECT_EQ("can't be read: Is a directory", ErrorOfFile(folder_.Path("folder.gltf")));
}

// Channels may share data, so that a file of some kilobytes asks for any number of keys.
TEST_F(GltfInput, ASmallFileCannotAskForAnyNumberOfKeys)
{
    constexpr int keys = 10000;
    GltfFile file;
    file.data.clear();
    std::vector<float> times(keys);
    std::iota(times.begin(), times.end(), 0.0F);
    file.Add(times);
    file.Add(std::vector<float>(keys * 3, 1.0F));
    file.document["buffers"][0]["byteLength"] = file.data.size();
    file.document["bufferViews"] = {{{"buffer", 0}, {"byteLength", keys * 4}},
                                    {{"buffer", 0}, {"byteOffset", keys * 4}, {"byteLength", keys * 12}}};
    file.document["accessors"][0]["count"] = keys;
    file.document["accessors"][1]["count"] = keys;
    json& channels = file.document["animations"][0]["channels"];
    json const channel = channels[0];
    ASSERT_EQ(1U, Import(file).streams.size());
    for (int i = 1; i < 700; ++i) channels.push_back(channel);
    EXPECT_EQ("animations[0].channels[41]: the file's channels ask for more keys than are accepted",
              ErrorOf("a.gltf", file.Text()));
}
