#include "host/gltf_json_private.h"

#include "host/import_error.h"
#include "host/names.h"

#include <algorithm>
#include <array>
#include <climits>
#include <cstdint>
#include <span>
#include <string>

namespace kfshost {

namespace {

using nlohmann::json;

// Deeper nesting than any glTF file has, and far less than would exhaust a stack.
constexpr int MaxDepth = 64;

enum class Shape { Index, Size, Text, Flag, Object, Objects };

// One member that animation needs, and what it must be.
struct Field {
    char const* name;
    Shape shape;
    bool required = false;
    std::span<Field const> inside = {};
};

constexpr Field AssetFields[] = {{"version", Shape::Text, true}};
constexpr Field BufferFields[] = {{"byteLength", Shape::Size, true}, {"uri", Shape::Text}};
constexpr Field ViewFields[] = {{"buffer", Shape::Index, true},
                                {"byteOffset", Shape::Size},
                                {"byteLength", Shape::Size, true},
                                {"byteStride", Shape::Size}};
constexpr Field SparseIndexFields[] = {
    {"bufferView", Shape::Index, true}, {"byteOffset", Shape::Index}, {"componentType", Shape::Index, true}};
constexpr Field SparseValueFields[] = {{"bufferView", Shape::Index, true}, {"byteOffset", Shape::Index}};
constexpr Field SparseFields[] = {{"count", Shape::Index, true},
                                  {"indices", Shape::Object, true, SparseIndexFields},
                                  {"values", Shape::Object, true, SparseValueFields}};
constexpr Field AccessorFields[] = {{"bufferView", Shape::Index},
                                    {"byteOffset", Shape::Size},
                                    {"componentType", Shape::Index, true},
                                    {"normalized", Shape::Flag},
                                    {"count", Shape::Size, true},
                                    {"type", Shape::Text, true},
                                    {"sparse", Shape::Object, false, SparseFields}};
constexpr Field NodeFields[] = {{"name", Shape::Text}};
constexpr Field TargetFields[] = {{"node", Shape::Index}, {"path", Shape::Text, true}};
constexpr Field ChannelFields[] = {{"sampler", Shape::Index, true}, {"target", Shape::Object, true, TargetFields}};
constexpr Field SamplerFields[] = {
    {"input", Shape::Index, true}, {"interpolation", Shape::Text}, {"output", Shape::Index, true}};
constexpr Field AnimationFields[] = {{"name", Shape::Text},
                                     {"channels", Shape::Objects, true, ChannelFields},
                                     {"samplers", Shape::Objects, true, SamplerFields}};
constexpr Field DocumentFields[] = {
    {"asset", Shape::Object, true, AssetFields},        {"buffers", Shape::Objects, false, BufferFields},
    {"bufferViews", Shape::Objects, false, ViewFields}, {"accessors", Shape::Objects, false, AccessorFields},
    {"nodes", Shape::Objects, false, NodeFields},       {"animations", Shape::Objects, false, AnimationFields}};

json CutDown(json const& object, std::span<Field const> fields, std::string const& place);

json CutDownList(json const& list, std::span<Field const> fields, std::string const& place)
{
    if (!list.is_array()) throw ImportError(place, "isn't a list");
    json result = json::array();
    for (std::size_t i = 0; i < list.size(); ++i)
        result.push_back(CutDown(list[i], fields, place + '[' + std::to_string(i) + ']'));
    return result;
}

json CutDownNumber(json const& value, std::uint64_t most, std::string const& place)
{
    if (!value.is_number_unsigned() || value.get<std::uint64_t>() > most)
        throw ImportError(place, "isn't a whole number from 0 to " + std::to_string(most));
    return value;
}

json CutDownMember(json const& value, Field const& field, std::string const& place)
{
    switch (field.shape) {
    case Shape::Index: return CutDownNumber(value, INT_MAX, place);
    case Shape::Size: return CutDownNumber(value, std::uint64_t{1} << 40, place);
    case Shape::Text:
        if (!value.is_string()) throw ImportError(place, "isn't a text");
        return value;
    case Shape::Flag:
        if (!value.is_boolean()) throw ImportError(place, "is neither true nor false");
        return value;
    case Shape::Object: return CutDown(value, field.inside, place);
    case Shape::Objects: return CutDownList(value, field.inside, place);
    }
    return {};
}

json CutDown(json const& object, std::span<Field const> fields, std::string const& place)
{
    if (!object.is_object()) throw ImportError(place, "isn't an object");
    json result = json::object();
    for (Field const& field : fields) {
        auto const member = object.find(field.name);
        std::string const memberPlace = place.empty() ? field.name : place + '.' + field.name;
        if (member != object.end())
            result[field.name] = CutDownMember(*member, field, memberPlace);
        else if (field.required)
            throw ImportError(memberPlace, "is missing");
    }
    return result;
}

// Where in a text its `byte`-th byte is, as people count; the one behind the last counts too.
std::string LineAndColumn(std::string_view text, std::size_t byte)
{
    std::string_view const before = text.substr(0, std::min(byte, text.size()));
    auto const line = 1 + std::ranges::count(before, '\n');
    std::size_t const lineStart = before.rfind('\n') + 1;  // npos + 1 is 0
    return "line " + std::to_string(line) + ", column " + std::to_string(byte - lineStart);
}

// Programs that print numbers as they come write these, which JSON doesn't have.
std::string WhatIsNoJson(std::string_view text, std::size_t byte)
{
    constexpr std::string_view ofWords = "+-ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz";
    std::size_t const start = text.substr(0, byte).find_last_not_of(ofWords) + 1;  // npos + 1 is 0
    std::string_view word = text.substr(start);
    word = word.substr(0, word.find_first_not_of(ofWords));
    for (std::string_view const name : {"NaN", "nan", "Infinity", "-Infinity", "inf", "-inf"})
        if (word == name) return '"' + std::string(word) + "\" isn't a number that JSON has";
    return "this isn't JSON";
}

json ParseText(std::string_view text)
{
    auto const limitDepth = [](int depth, json::parse_event_t, json&) {
        if (depth > MaxDepth)
            throw ImportError("", "the JSON is nested more than " + std::to_string(MaxDepth) + " deep");
        return true;
    };
    try {
        return json::parse(text.begin(), text.end(), limitDepth);
    } catch (json::parse_error const& error) {
        throw ImportError(LineAndColumn(text, error.byte),
                          error.byte > text.size() ? "the JSON text ends too early" : WhatIsNoJson(text, error.byte));
    } catch (json::exception const&) {
        throw ImportError("", "the JSON has a number that is out of range");
    }
}

// Extensions that change nothing about keys: looks, lights, and how meshes are stored.
bool LeavesAnimationAlone(std::string_view extension)
{
    constexpr std::array<std::string_view, 9> prefixes{
        "KHR_materials_", "KHR_texture_", "KHR_lights_", "KHR_mesh_quantization", "KHR_draco_mesh_compression",
        "KHR_xmp",        "EXT_texture_", "EXT_lights_", "MSFT_texture_"};
    return std::ranges::any_of(prefixes, [&](std::string_view prefix) { return extension.starts_with(prefix); });
}

void RefuseUnknownExtensions(json const& document)
{
    auto const required = document.find("extensionsRequired");
    if (required == document.end() || !required->is_array()) return;
    for (json const& name : *required) {
        if (name.is_string() && !LeavesAnimationAlone(name.get_ref<std::string const&>())) {
            throw ImportError("extensionsRequired",
                              "needs " + CleanName(name.get_ref<std::string const&>()) + ", which isn't supported");
        }
    }
}

}  // namespace

json ParseGltfJson(std::string_view text)
{
    json const document = ParseText(text);
    json result = CutDown(document, DocumentFields, "");
    auto const& version = result["asset"]["version"].get_ref<std::string const&>();
    if (!version.starts_with("2."))
        throw ImportError("asset.version", "is \"" + CleanName(version) + "\"; versions 2.x are supported");
    RefuseUnknownExtensions(document);
    return result;
}

}  // namespace kfshost
