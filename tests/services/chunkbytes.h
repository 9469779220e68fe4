// Chunk files made by hand, byte by byte, so that a test doesn't take the writer's word for what a file looks like; and
// a reader that takes everything there is.
#pragma once

#include "frame/services/chunkfile.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <initializer_list>
#include <ostream>
#include <span>
#include <string>

inline std::string Long(std::uint32_t value)
{
    std::string bytes;
    for (int shift = 24; shift >= 0; shift -= 8) bytes += static_cast<char>(value >> shift);
    return bytes;
}

inline std::string Atom(std::string const& id, std::string const& data)
{
    return id + Long(static_cast<std::uint32_t>(data.size())) + data + std::string(data.size() & 1, '\0');
}

inline std::string List(std::string const& type, std::string const& chunks)
{
    return "LIST" + Long(static_cast<std::uint32_t>(chunks.size() + 4)) + type + chunks;
}

inline std::string Form(std::string const& chunks, std::uint32_t major = 95, std::uint32_t minor = 0,
                        std::uint32_t encoding = 0)
{
    const std::string all = "proj" + Atom("vers", Long(major) + Long(minor) + Long(encoding)) + chunks;
    return "KFSF" + Long(static_cast<std::uint32_t>(all.size())) + all;
}

inline std::span<unsigned char const> Span(std::string const& bytes)
{
    return {reinterpret_cast<unsigned char const*>(bytes.data()), bytes.size()};
}

inline std::string Bytes(CKF_File const& file)
{
    std::span<unsigned char const> const bytes = file.GetBytes();
    return {bytes.begin(), bytes.end()};
}

inline u16str Text(char const* ascii)
{
    return Q_AsciiToUTF16String(ascii);
}

inline u16str Units(std::initializer_list<int> units)
{
    return u16str(units.begin(), units.end());
}

// UTF-8 the plain way. A surrogate without a partner counts as its own code point, or as `lone`.
inline std::string PlainUtf8(u16str const& units, int lone = 0)
{
    std::string bytes;
    for (std::size_t i = 0; i < units.size(); ++i) {
        int point = units[i];
        if (point / 0x400 == 0x36 && i + 1 < units.size() && units[i + 1] / 0x400 == 0x37)
            point = 0x10000 + point % 0x400 * 0x400 + units[++i] % 0x400;
        else if (lone != 0 && point / 0x800 == 0x1B)
            point = lone;
        int const more = point < 0x80 ? 0 : point < 0x800 ? 1 : point < 0x10000 ? 2 : 3;
        constexpr int marks[] = {0, 0xC0, 0xE0, 0xF0};
        bytes += static_cast<char>(marks[more] + (point >> (6 * more)));
        for (int k = more; k-- > 0;) bytes += static_cast<char>(0x80 + (point >> (6 * k)) % 0x40);
    }
    return bytes;
}

// The code that a call throws, or 0.
template <class Call>
int Thrown(Call call)
{
    try {
        call();
        return 0;
    } catch (int code) {
        return code;
    }
}

// What a file holds from the present position to the end of the open list, in the form "(kfgp kfsb:4 (kfbs ...))".
inline std::string Outline(CKF_File* file, CKF_ChunkInfo const* parent = nullptr)
{
    std::string text;
    for (;;) {
        bool found = false;
        CKF_ScDescend const descent(file, 0, 0, parent, &found);
        if (!found) return text;
        CKF_ChunkInfo const* const chunk = descent.GetChunkInfo();
        auto const spell = [](int id) { return Long(static_cast<std::uint32_t>(id)); };
        if (!text.empty()) text += ' ';
        if (chunk->id == CKF_ListId) {
            std::string const inner = Outline(file, chunk);
            text += "(" + spell(chunk->listType) + (inner.empty() ? "" : " ") + inner + ")";
        } else {
            std::string data(chunk->size, '\0');
            int size = static_cast<int>(chunk->size);
            if (int const code = CKF_ReadChunkData(file, &size, data.data())) throw code;
            text += spell(chunk->id) + ":" + std::to_string(size);
        }
    }
}

// A file with a bit of everything: lists in lists, odd sizes, an empty atom, an empty list, texts, a list of items.
inline std::string NestedSample()
{
    std::string const leaf =
        List("kfbs", Atom("kfsb", Long(7)) + Atom("kfsn", "odd") + Atom("kfb4", std::string(124, 'b')) +
                         Atom("seql", Long(3) + Long(2) + "abcdef") + Atom("Utf8", "\xC3\xA4"));
    std::string const inner =
        List("kfgp", Atom("kfmn", std::string(40, 'm')) + leaf + Atom("none", "") + List("void", ""));
    return Form(Atom("odd1", "x") + List("kfgp", Atom("kfsb", Long(0)) + inner + leaf) + Atom("last", "12345"));
}
inline char const* const NestedOutline =
    "odd1:1 (kfgp kfsb:4 (kfgp kfmn:40 (kfbs kfsb:4 kfsn:3 kfb4:124 seql:14 Utf8:2) none:0 (void)) "
    "(kfbs kfsb:4 kfsn:3 kfb4:124 seql:14 Utf8:2)) last:5";
