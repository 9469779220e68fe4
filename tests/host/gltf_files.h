#pragma once

#include <nlohmann/json.hpp>

#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

// A small glTF file that is right: one node whose translation has three linear keys. Tests change one thing about it.
class GltfFile {
public:
    GltfFile()
    {
        Add({0.0F, 0.5F, 1.0F});
        Add({1, 2, 3, 4, 5, 6, 7, 8, 9});
        document = {{"asset", {{"version", "2.0"}}},
                    {"nodes", {{{"name", "ball"}}}},
                    {"accessors",
                     {{{"bufferView", 0}, {"componentType", 5126}, {"count", 3}, {"type", "SCALAR"}},
                      {{"bufferView", 1}, {"componentType", 5126}, {"count", 3}, {"type", "VEC3"}}}},
                    {"bufferViews",
                     {{{"buffer", 0}, {"byteLength", 12}}, {{"buffer", 0}, {"byteOffset", 12}, {"byteLength", 36}}}},
                    {"buffers", {{{"byteLength", 48}}}},
                    {"animations",
                     {{{"name", "move"},
                       {"samplers", {{{"input", 0}, {"output", 1}}}},
                       {"channels", {{{"sampler", 0}, {"target", {{"node", 0}, {"path", "translation"}}}}}}}}}};
    }

    void Add(std::vector<float> const& numbers)
    {
        std::size_t const start = data.size();
        data.resize(start + numbers.size() * 4);
        std::memcpy(data.data() + start, numbers.data(), numbers.size() * 4);
    }
    // Replaces the floats from byte `offset` on.
    void Put(std::size_t offset, std::vector<float> const& numbers)
    {
        std::memcpy(data.data() + offset, numbers.data(), numbers.size() * 4);
    }

    // With the data embedded, unless the buffer has a uri already.
    std::string Text() const
    {
        nlohmann::json whole = document;
        nlohmann::json& buffer = whole["buffers"][0];
        if (buffer.is_object() && !buffer.contains("uri"))
            buffer["uri"] = "data:application/octet-stream;base64," + Base64();
        return whole.dump();
    }

    std::string Binary() const
    {
        std::string text = document.dump();
        text.append((4 - text.size() % 4) % 4, ' ');
        std::string padded = data;
        padded.append((4 - padded.size() % 4) % 4, '\0');
        std::string bytes = "glTF" + Word(2) + Word(28 + text.size() + padded.size());
        return bytes + Word(text.size()) + "JSON" + text + Word(padded.size()) + std::string("BIN\0", 4) + padded;
    }

    static std::string Word(std::size_t value)
    {
        auto const word = static_cast<std::uint32_t>(value);
        return {reinterpret_cast<char const*>(&word), 4};
    }

    std::string Base64() const
    {
        constexpr char const* digits = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
        std::string text;
        for (std::size_t i = 0; i < data.size(); i += 3) {
            auto const byte = [&](std::size_t at) {
                return at < data.size() ? static_cast<unsigned char>(data[at]) : 0U;
            };
            unsigned int const three = byte(i) << 16 | byte(i + 1) << 8 | byte(i + 2);
            for (int digit = 0; digit < 4; ++digit) {
                bool const isPadding = i + static_cast<std::size_t>(digit) > data.size();
                text += isPadding ? '=' : digits[three >> (18 - 6 * digit) & 63];
            }
        }
        return text;
    }

    nlohmann::json document;
    std::string data;
};
