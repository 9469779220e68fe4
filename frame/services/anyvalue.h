// Values of mixed kinds in trees, and their JSON text.
//
// Threads: plain values; one thread an object at a time.
#pragma once

#include "frame/services/export.h"
#include "frame/services/strings.h"

#include <boost/property_tree/ptree.hpp>

#include <cstdint>
#include <variant>

// What the operations below throw, as an int.
inline constexpr int Q_Err_BadJson =
    0x1703;  // not JSON, deeper than Q_MaxJsonDepth, or a number that isn't a whole one of 64 bits
inline constexpr int Q_Err_NotANumber = 0x1704;  // a value that was asked for a number and has none
inline constexpr int Q_Err_NoChild = 0x1705;     // a tree without that child

inline constexpr int Q_MaxJsonDepth = 128;

// Nothing, a text, or a whole number.
class KFS_SERVICE_API Q_Any {
public:
    Q_Any() = default;
    explicit Q_Any(u16str text) : value_(std::move(text)) {}
    // The bool has no meaning.
    explicit Q_Any(std::int64_t number, bool reserved = false) : value_(number) { (void)reserved; }

    bool IsEmpty() const noexcept { return std::holds_alternative<std::monostate>(value_); }
    bool IsNumber() const noexcept { return std::holds_alternative<std::int64_t>(value_); }

    // As text: a number in decimal digits, nothing as the empty text.
    u16str GetAs_Str() const;
    // As a number: a text must be one whole decimal number with nothing around it. Throws Q_Err_NotANumber. Wide enough
    // for every index of a stream id, the one for "no index" included.
    std::int64_t GetAs_int() const;

    bool operator==(Q_Any const&) const = default;

private:
    std::variant<std::monostate, std::int64_t, u16str> value_;
};

// Children keep their order, and keys may repeat.
using Q_AnyTree = boost::property_tree::basic_ptree<u16str, Q_Any>;

// Operations on a tree, which it borrows.
//
// In JSON a node with children is an object, or an array if all its keys are empty; a node without children is its
// value: a number, a text, or null. The root is always one of the first two, {} when it is empty. A node that has both
// a value and children is an object too, with the value in front under Q_MixedValueKey.
class KFS_SERVICE_API Q_AnyTreeWrapper {
public:
    explicit Q_AnyTreeWrapper(Q_AnyTree& tree) noexcept : tree_(&tree) {}

    // Sets the child with this key, or adds it behind the others. A key is taken whole; it isn't a path.
    void put(u16str const& key, Q_Any const& value);
    void put(u16str const& key, Q_AnyTree const& subTree);

    // The value of the first child with this key. Throws Q_Err_NoChild.
    Q_Any const& get_child_any(u16str const& key) const;

    // Without blanks. A surrogate without a partner becomes U+FFFD. Throws Q_Err_BadJson for a tree deeper than
    // Q_MaxJsonDepth.
    u16str GetAs_JSON() const;

    // Replaces the tree by what an object or an array says, and gives nodes that have both a value and children their
    // value back. True and false are 1 and 0. Throws Q_Err_BadJson, and the tree is then what it was.
    void SetFrom_JSON_HackRecoverMagicMixed(u16str const& text);

    // Calls `visit(depth, key, subTree, value)` for each node below the root, parents first, in order; children of the
    // root have depth 1. Where it returns false, the walk doesn't go into that node.
    template <class Visit>
    void for_each(Visit&& visit) const
    {
        Walk(*tree_, 1, visit);
    }

private:
    template <class Visit>
    static void Walk(Q_AnyTree const& tree, int depth, Visit& visit)
    {
        for (auto const& [key, child] : tree)
            if (visit(depth, key, child, child.data())) Walk(child, depth + 1, visit);
    }

    Q_AnyTree* tree_;
};

// The key that no other tool is likely to use.
KFS_SERVICE_API u16str Q_MixedValueKey();
