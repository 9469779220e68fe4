#pragma once

#include "host/gltf_document_private.h"

#include <cstddef>
#include <string>
#include <vector>

namespace kfshost {

// Reads the numbers of one accessor: plain or sparse, floats or normalised integers. What it says about itself is held
// against the bytes that are there before anything is allocated. All of it throws ImportError.
class AccessorReader {
public:
    // `index` is as the file has it; `place` is who asks.
    AccessorReader(GltfDocument const& document, int index, std::string const& place);

    std::string const& Place() const { return place_; }
    std::size_t Count() const { return accessor_->count; }
    // Refuses an accessor whose elements aren't of that type (TINYGLTF_TYPE_...).
    void RequireType(int type, char const* name) const;
    void RequireFloats() const;

    // Count times components numbers, all finite.
    std::vector<double> ReadNumbers() const;

private:
    // `count` elements of `size` bytes, `stride` apart; null stands for zeros.
    struct Elements {
        unsigned char const* first = nullptr;
        std::size_t count = 0;
        std::size_t stride = 0;
    };

    Elements Find(int view, std::size_t offset, std::size_t count, std::size_t size, char const* what) const;
    double ReadComponent(unsigned char const* bytes) const;
    void ReadElement(unsigned char const* bytes, double* numbers) const;
    void ApplySparse(std::vector<double>& numbers) const;

    GltfDocument const* document_;
    std::string place_;
    tinygltf::Accessor const* accessor_;
    std::size_t components_;
    std::size_t componentSize_;
};

}  // namespace kfshost
