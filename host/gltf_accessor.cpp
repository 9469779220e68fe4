#include "host/gltf_accessor_private.h"

#include "host/import_error.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstdint>
#include <cstring>

namespace kfshost {

static_assert(std::endian::native == std::endian::little, "glTF is little-endian, and its bytes are read as they are");

namespace {

template <class T>
T ReadBytes(unsigned char const* bytes)
{
    T value;
    std::memcpy(&value, bytes, sizeof value);
    return value;
}

tinygltf::Accessor const* FindAccessor(tinygltf::Model const& model, int index, std::string const& place)
{
    if (index < 0 || static_cast<std::size_t>(index) >= model.accessors.size()) {
        throw ImportError(place, "asks for accessor " + std::to_string(index) + " of " +
                                     std::to_string(model.accessors.size()));
    }
    return &model.accessors[static_cast<std::size_t>(index)];
}

std::size_t IndexSize(int componentType)
{
    switch (componentType) {
    case TINYGLTF_COMPONENT_TYPE_UNSIGNED_BYTE: return 1;
    case TINYGLTF_COMPONENT_TYPE_UNSIGNED_SHORT: return 2;
    case TINYGLTF_COMPONENT_TYPE_UNSIGNED_INT: return 4;
    default: return 0;
    }
}

std::size_t ReadIndex(unsigned char const* bytes, std::size_t size)
{
    return size == 1 ? bytes[0] : size == 2 ? ReadBytes<std::uint16_t>(bytes) : ReadBytes<std::uint32_t>(bytes);
}

}  // namespace

AccessorReader::AccessorReader(GltfDocument const& document, int index, std::string const& place)
    : document_(&document),
      place_("accessors[" + std::to_string(index) + ']'),
      accessor_(FindAccessor(document.model, index, place)),
      components_(
          static_cast<std::size_t>(tinygltf::GetNumComponentsInType(static_cast<std::uint32_t>(accessor_->type))))
{
    int const type = accessor_->componentType;
    int const size = tinygltf::GetComponentSizeInBytes(static_cast<std::uint32_t>(type));
    bool const isSmallInteger = type >= TINYGLTF_COMPONENT_TYPE_BYTE && type <= TINYGLTF_COMPONENT_TYPE_UNSIGNED_SHORT;
    if (size <= 0 || (type != TINYGLTF_COMPONENT_TYPE_FLOAT && !isSmallInteger))
        throw ImportError(place_, "has components of type " + std::to_string(type) + ", which animation can't have");
    if (isSmallInteger && !accessor_->normalized) throw ImportError(place_, "has integers that aren't normalized");
    componentSize_ = static_cast<std::size_t>(size);
    auto const& sparse = accessor_->sparse;
    auto const sparseCount = sparse.isSparse ? static_cast<std::size_t>(std::max(sparse.count, 0)) : 0;
    if (sparseCount > accessor_->count) {
        throw ImportError(place_,
                          "replaces " + std::to_string(sparseCount) + " elements of " + std::to_string(Count()));
    }
    // Zeros that no byte stands for are good for little; a great many of them are a trap.
    constexpr std::size_t mostZeros = 1 << 16;
    if (accessor_->bufferView < 0 && accessor_->count - sparseCount > mostZeros)
        throw ImportError(place_, "has " + std::to_string(Count()) + " elements and no data for them");
}

void AccessorReader::RequireType(int type, char const* name) const
{
    if (accessor_->type != type) throw ImportError(place_, std::string("isn't of type ") + name);
}

void AccessorReader::RequireFloats() const
{
    if (accessor_->componentType != TINYGLTF_COMPONENT_TYPE_FLOAT) throw ImportError(place_, "isn't made of floats");
}

AccessorReader::Elements AccessorReader::Find(int view, std::size_t offset, std::size_t count, std::size_t size,
                                              char const* what) const
{
    if (view < 0 || static_cast<std::size_t>(view) >= document_->model.bufferViews.size()) {
        throw ImportError(place_, std::string("asks for bufferView ") + std::to_string(view) + " of " +
                                      std::to_string(document_->model.bufferViews.size()));
    }
    tinygltf::BufferView const& bufferView = document_->model.bufferViews[static_cast<std::size_t>(view)];
    std::string const viewPlace = "bufferViews[" + std::to_string(view) + ']';
    if (bufferView.buffer < 0 || static_cast<std::size_t>(bufferView.buffer) >= document_->buffers.size()) {
        throw ImportError(viewPlace, "asks for buffer " + std::to_string(bufferView.buffer) + " of " +
                                         std::to_string(document_->buffers.size()));
    }
    auto const data = document_->buffers[static_cast<std::size_t>(bufferView.buffer)];
    if (bufferView.byteOffset > data.size() || bufferView.byteLength > data.size() - bufferView.byteOffset)
        throw ImportError(viewPlace, "reaches beyond its buffer of " + std::to_string(data.size()) + " bytes");
    std::size_t const stride = bufferView.byteStride == 0 ? size : bufferView.byteStride;
    if (stride < size) throw ImportError(viewPlace, "has a byteStride smaller than an element");
    if (count == 0) return {};
    bool const startsInside = offset <= bufferView.byteLength && bufferView.byteLength - offset >= size;
    if (!startsInside || (bufferView.byteLength - offset - size) / stride < count - 1) {
        throw ImportError(place_, "says it has " + std::to_string(count) + ' ' + what +
                                      ", more than its bufferView of " + std::to_string(bufferView.byteLength) +
                                      " bytes holds");
    }
    return {data.data() + bufferView.byteOffset + offset, count, stride};
}

double AccessorReader::ReadComponent(unsigned char const* bytes) const
{
    switch (accessor_->componentType) {
    case TINYGLTF_COMPONENT_TYPE_BYTE: return std::max(ReadBytes<std::int8_t>(bytes) / 127.0, -1.0);
    case TINYGLTF_COMPONENT_TYPE_UNSIGNED_BYTE: return bytes[0] / 255.0;
    case TINYGLTF_COMPONENT_TYPE_SHORT: return std::max(ReadBytes<std::int16_t>(bytes) / 32767.0, -1.0);
    case TINYGLTF_COMPONENT_TYPE_UNSIGNED_SHORT: return ReadBytes<std::uint16_t>(bytes) / 65535.0;
    default: return static_cast<double>(ReadBytes<float>(bytes));
    }
}

void AccessorReader::ReadElement(unsigned char const* bytes, double* numbers) const
{
    for (std::size_t i = 0; i < components_; ++i) numbers[i] = ReadComponent(bytes + i * componentSize_);
}

void AccessorReader::ApplySparse(std::vector<double>& numbers) const
{
    auto const& sparse = accessor_->sparse;
    auto const count = static_cast<std::size_t>(std::max(sparse.count, 0));
    std::size_t const indexSize = IndexSize(sparse.indices.componentType);
    if (indexSize == 0)
        throw ImportError(place_, "has sparse indices of type " + std::to_string(sparse.indices.componentType));
    Elements const indices = Find(sparse.indices.bufferView, static_cast<std::size_t>(sparse.indices.byteOffset), count,
                                  indexSize, "sparse indices");
    Elements const values = Find(sparse.values.bufferView, static_cast<std::size_t>(sparse.values.byteOffset), count,
                                 components_ * componentSize_, "sparse values");
    for (std::size_t i = 0; i < indices.count; ++i) {
        std::size_t const index = ReadIndex(indices.first + i * indices.stride, indexSize);
        if (index >= accessor_->count)
            throw ImportError(place_, "replaces element " + std::to_string(index) + " of " + std::to_string(Count()));
        ReadElement(values.first + i * values.stride, &numbers[index * components_]);
    }
}

std::vector<double> AccessorReader::ReadNumbers() const
{
    Elements elements;
    if (accessor_->bufferView >= 0) {
        elements = Find(accessor_->bufferView, accessor_->byteOffset, accessor_->count, components_ * componentSize_,
                        "elements");
    }
    std::vector<double> numbers(accessor_->count * components_, 0.0);
    for (std::size_t i = 0; i < elements.count; ++i)
        ReadElement(elements.first + i * elements.stride, &numbers[i * components_]);
    if (accessor_->sparse.isSparse) ApplySparse(numbers);
    auto const bad = std::ranges::find_if_not(numbers, [](double number) { return std::isfinite(number); });
    if (bad != numbers.end()) {
        auto const element = static_cast<std::size_t>(bad - numbers.begin()) / components_;
        throw ImportError(place_, "element " + std::to_string(element) + " isn't a finite number");
    }
    return numbers;
}

}  // namespace kfshost
