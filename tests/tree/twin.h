#pragma once

#include "tests/support/groups.h"

#include <algorithm>
#include <functional>
#include <memory>
#include <numeric>
#include <optional>

// A tree of streams as plainly as it can be told: each group is a vector, each edit is its list of steps, and each
// notification is a line of text. It holds no stream and shares no code with the library.

// The kinds. A leaf has a default; a group lists its kinds in display order. "nest" contains itself.
struct TwinKind {
    char const* name;
    char shape;  // leaf, named group, list
    double value;
    std::vector<std::string> layout;
};
inline std::vector<TwinKind> const TwinKinds{
    {"a", 'l', 1.0, {}},
    {"b", 'l', 5.0, {}},
    {"pair", 'n', 0, {"b", "a"}},
    {"list", 'i', 0, {"a", "node", "nest", "list"}},
    {"node", 'n', 0, {"a", "pair", "list", "b"}},
    {"nest", 'n', 0, {"node", "nest", "a"}},
};
inline TwinKind const& KindOf(std::string const& name)
{
    return *std::ranges::find(TwinKinds, name, &TwinKind::name);
}

// Edits, as a script says them. Each number is taken modulo what there is.
inline std::vector<std::string> const Ops{"Insert",  "Append",    "Swap",      "Remove", "RemoveChild", "Move",
                                          "Upgrade", "SwapNamed", "Canonical", "Reset",  "Copy",        "Duplicate",
                                          "Flags",   "Name",      "Value",     "Throw",  "Independent"};
struct Edit {
    std::string op;
    unsigned int group = 0, at = 0, to = 0;
};
inline std::vector<std::string> const Moments{"before-insert", "after-insert", "before-remove",  "after-remove",
                                              "before-swap",   "after-swap",   "before-reorder", "after-reorder"};
struct Step {
    Edit edit;
    std::string moment;  // the first such notification of the edit makes a listener do `nested`
    Edit nested;
};

constexpr unsigned int TwinFlags[] = {0x1, 0x2, 0x8, 0x10, 0x20, 0x200, 0x1000, 0x2000, 0x20000, 0x40000, 0x80000};

// What is the same for a twin and a tree of streams: which node an edit of a script means, what a listener does, and how a
// tree is shown. `Tree` has the edits themselves.
template <class Tree, class Node>
class Scripted {
public:
    void Do(Step const& step)
    {
        moment_ = step.moment;
        nested_ = step.nested;
        if (int const code = Self().Try([&] { Do(step.edit, false); })) log.push_back("code " + std::to_string(code));
        moment_.clear();
        for (Node* const gone : std::exchange(limbo_, {})) Self().Delete(gone);
    }

    // The tree at a moment: names and identities; * for who isn't its parent's, ~ for what is canonical.
    std::string Show(Node* node, Node const* parent, bool whole)
    {
        std::string text = Self().Label(node) + (Self().Parent(node) == parent ? "" : "*");
        if (whole) text += Self().Facts(node);
        if (Shape(node) == 'l') return text;
        text += "[";
        for (std::size_t i = 0; i < Count(node); ++i) {
            std::optional<Node*> const child = Self().Child(node, i);
            text += !child ? "-" : *child ? Show(*child, node, whole) : Layout(node)[i] + "~";
            text += ' ';
        }
        return text + "]";
    }

    // The real nodes of such shapes, depth first.
    std::vector<Node*> Of(std::string const& shapes, Node* from)
    {
        std::vector<Node*> nodes;
        if (shapes.find(Shape(from)) != std::string::npos) nodes.push_back(from);
        for (std::size_t i = 0; i < Count(from); ++i)
            if (Node* const child = Self().Child(from, i).value_or(nullptr))
                for (Node* const node : Of(shapes, child)) nodes.push_back(node);
        return nodes;
    }

    std::vector<std::string> log;

protected:
    char Shape(Node const* node) { return KindOf(Self().Kind(node)).shape; }
    std::vector<std::string> const& Layout(Node const* group) { return KindOf(Self().Kind(group)).layout; }
    std::size_t Count(Node const* node)
    {
        return Shape(node) == 'i' ? Self().Length(node) : Shape(node) == 'n' ? Layout(node).size() : 0;
    }

    void Heard(std::string const& line)
    {
        log.push_back(line);
        std::string const what = line.substr(0, line.find(' '));
        if (std::ranges::count(Moments, what) == 0) return;
        log.back() += " in " + Show(Self().Root(), nullptr, false);
        if (what != moment_) return;
        moment_.clear();
        if (nested_.op == "Throw") throw int{77};
        if (int const code = Self().Try([&] { Do(nested_, true); }))
            log.push_back("nested code " + std::to_string(code));
    }

private:
    Tree& Self() { return static_cast<Tree&>(*this); }
    void Own(Node* node)
    {
        if (node) limbo_.push_back(node);
    }

    void Do(Edit const& e, bool isNested)
    {
        std::string const& op = e.op;
        auto const pick = [&](char const* shapes, unsigned int number) -> Node* {
            std::vector<Node*> const nodes = Of(shapes, Self().Root());
            return nodes.empty() ? nullptr : nodes[number % nodes.size()];
        };
        Node* const list = pick("i", e.group);
        Node* const group = pick("n", e.group);
        Node* const node = pick("lni", e.group);
        std::size_t const count = Count(list), at = e.at % (count + 2), slot = group ? e.at % Count(group) : 0;
        bool const isOn = e.to % 2 == 1;
        if (op == "Insert" || op == "Append" || op == "Swap") {
            auto made = Self().Make(TwinKinds[e.to % TwinKinds.size()].name, e.to % 5 == 1);
            if (e.to % 7 == 2) Self().SetIndependent(&*made, true);
            if (op == "Swap")
                Own(Self().Swap(list, at, made));
            else if (op == "Insert")
                Self().Insert(list, at, made);
            else
                Self().Append(list, made);
        } else if (op == "Remove") {
            Own(Self().Remove(list, at));
        } else if (op == "RemoveChild") {
            bool const isNamed = group && !isNested && isOn;
            Node* const from = isNamed ? group : list;
            if (Count(from) == 0) return;
            Node* const child = Self().Child(from, e.at % Count(from)).value_or(nullptr);
            if (!child || !Self().RemoveChild(from, child)) return;
            Own(child);
            if (!isNamed) return;
            moment_.clear();
            Self().Reset(group);
        } else if (op == "Move") {
            Self().Move(list, e.at % (count + 1), isNested && count > 0 ? e.to % count : e.to % (count + 1));
        } else if (op == "Duplicate") {
            Self().Duplicate(list, at);
        } else if (op == "Flags") {
            unsigned int const bit = TwinFlags[e.at % std::size(TwinFlags)];
            Self().SetFlags(node, isOn ? bit : 0, bit);
        } else if (op == "Name") {
            Self().SetName(node, e.to % 3 == 0 ? Self().Kind(node) : "name " + std::to_string(e.to % 4));
        } else if (op == "Independent") {
            Self().SetIndependent(node, isOn);
        } else if (op == "Value") {
            if (Node* const leaf = pick("l", e.group)) Self().SetValue(leaf, e.to % 6);
        } else if (!group) {
            return;
        } else if (op == "Upgrade") {
            Self().Upgrade(group, slot, e.to % 8);
        } else if (op == "SwapNamed") {
            auto made = Self().Make(e.to % 5 == 4 ? "list" : Layout(group)[slot], isOn);
            if (e.to % 3 == 2) Self().SetIndependent(&*made, true);
            Own(Self().SwapNamed(group, made));
        } else if (op == "Canonical") {
            Own(Self().SwapCanonical(group, slot));
        } else if (op == "Reset" && !isNested) {
            moment_.clear();
            Self().Reset(group);
        } else if (op == "Copy" && !isNested) {
            moment_.clear();
            Node* const other = pick("n", e.at);
            // Not from below the group itself, which may go with what is replaced.
            for (Node const* up = other; up; up = Self().Parent(up))
                if (up == group) return;
            Self().CopyFrom(group, other);
        }
    }

    std::string moment_;
    Edit nested_;
    std::vector<Node*> limbo_;  // what the script's user owns
};

struct Twin {
    std::string kind, name;
    unsigned int flags = 1, scale = 600;
    double value = 0.0;
    bool keyed = false;
    int heard = 0;
    int id = 0;  // given when it is first spoken of
    Twin* parent = nullptr;
    std::vector<Twin*> children;  // null for a canonical one

    char Shape() const { return KindOf(kind).shape; }
    std::vector<std::string> const& Layout() const { return KindOf(kind).layout; }
};

struct Broken {
    std::string text;
};

class TwinTree : public Scripted<TwinTree, Twin> {
public:
    TwinTree() : root(Make("list", false)) { root->scale = RootScale; }
    ~TwinTree() { Free(root); }
    TwinTree(TwinTree const&) = delete;
    TwinTree& operator=(TwinTree const&) = delete;

    // Makes `to`, which is as new, what a load of a file of `from` makes of it.
    void Load(Twin const* from, Twin* to)
    {
        to->flags = (from->flags & ~Unsaved) | (to->flags & Unsaved);
        if (!to->parent || (to->parent->Shape() == 'i' && from->name != from->kind))
            to->name = from->name, to->flags &= ~0x40000U;
        to->value = from->value, to->keyed = from->keyed;
        if (to->Shape() == 'l') to->scale = from->scale;
        for (std::size_t i = 0; i < from->children.size(); ++i) {
            Twin const* const child = from->children[i];
            if (!child || !IsWritten(from, child)) continue;
            Twin* const made = Make(child->kind, false);
            made->parent = to;
            if (to->Shape() == 'i')
                to->children.push_back(made);
            else
                Free(std::exchange(to->children[i], made));
            Load(child, made);
        }
    }

    Twin* Clone(Twin const* source) const
    {
        auto* const copy = new Twin(*source);
        copy->id = 0;
        copy->parent = nullptr;
        for (Twin*& child : copy->children) {
            if (!child) continue;
            child = Clone(child);
            child->parent = copy;
        }
        return copy;
    }

    void Free(Twin* node) const
    {
        if (!node || node == &Hole) return;
        for (Twin* const child : node->children) Free(child);
        delete node;
    }

    static constexpr unsigned int RootScale = 30, Unsaved = 0x1D0EC;
    Twin* root;

private:
    friend Scripted<TwinTree, Twin>;

    // What the script asks of a tree.
    Twin* Root() const { return root; }
    static std::string const& Kind(Twin const* node) { return node->kind; }
    static Twin const* Parent(Twin const* node) { return node->parent; }
    static std::size_t Length(Twin const* list) { return list->children.size(); }
    static std::optional<Twin*> Child(Twin const* group, std::size_t i)
    {
        return group->children[i] == &Hole ? std::nullopt : std::optional(group->children[i]);
    }
    std::string Label(Twin* node)
    {
        if (node->id == 0) node->id = ++lastId_;
        return node->kind + "#" + std::to_string(node->id);
    }
    static std::string Facts(Twin const* node)
    {
        bool active = true, hidden = (node->flags & 2) != 0;
        int depth = 0;
        std::string path;
        for (Twin const* at = node; at->parent; at = at->parent, ++depth) {
            bool const isInList = at->parent->Shape() == 'i';
            path = "/" + (isInList ? std::to_string(PlaceOf(at->parent, at)) : "") + at->kind + path;
            active = active && (at->parent->flags & 1) != 0;
            hidden = hidden || (at->parent->flags & 2) != 0;
        }
        std::string text = "{" + std::to_string(node->flags) + " " + node->name + (active ? "" : " off") +
                           (hidden ? " hidden" : "") + (IsModified(node) ? " modified" : "") +
                           (IsAnimated(node) ? " animated" : "") + " " + std::to_string(depth) + " " + path;
        if (node->Shape() == 'l') text += " " + std::to_string(node->value) + " at " + std::to_string(node->scale);
        return text + "}";
    }
    static bool IsModified(Twin const* node)
    {
        if (node->Shape() == 'l') return node->keyed || node->value != KindOf(node->kind).value;
        if (node->Shape() == 'i') return !node->children.empty();
        return std::ranges::any_of(node->children, [](Twin const* c) { return c && IsModified(c); });
    }
    static bool IsAnimated(Twin const* node)
    {
        return node->keyed || std::ranges::any_of(
                                  node->children, [](Twin const* c) { return c && IsAnimated(c); });
    }
    static bool IsWritten(Twin const* group, Twin const* child)
    {
        return group->Shape() == 'i' || child->Shape() == 'n' || IsModified(child) || child->flags != 1 ||
               child->name != child->kind;
    }

    // A node as the factory makes it: subgroups are its own, and empty of real streams.
    static Twin* Make(std::string const& kind, bool keyed)
    {
        Twin* const made = MakeEmpty(kind);
        made->keyed = keyed && made->Shape() == 'l';
        if (made->Shape() == 'n') FillIn(made);
        return made;
    }
    static Twin* MakeEmpty(std::string const& kind)
    {
        auto* const made = new Twin;
        made->kind = made->name = kind;
        made->value = KindOf(kind).value;
        if (made->Shape() == 'n') made->children.resize(made->Layout().size());
        return made;
    }
    static void FillIn(Twin* group)
    {
        for (std::size_t i = 0; i < group->children.size(); ++i) {
            bool const isLeaf = KindOf(group->Layout()[i]).shape == 'l';
            group->children[i] = isLeaf ? nullptr : MakeEmpty(group->Layout()[i]);
            if (!isLeaf) group->children[i]->parent = group;
        }
    }

    int Probe(Twin* node) const
    {
        if (node == root) return 1;
        if (node->heard != 0 || !node->parent) return node->heard;
        Twin* top = node->parent;
        while (top->parent) top = top->parent;
        return node->heard = Probe(top);
    }
    // `line` is asked for where somebody hears it: speaking of a node gives it its number.
    template <class Line>
    void Tell(Twin* gate, Line const& line)
    {
        if (!paused_ && Probe(gate) == 1) Heard(line());
    }
    void Tell(Twin* group, char const* what, Twin* child, std::size_t index)
    {
        Tell(
            group,
            [&] {
                std::string line =
                    std::string(what) + " " + Label(group) + " ";  // the group before the child: both may be new
                line += child ? Label(child) : group->Layout()[index] + "~";
                return line + " " + std::to_string(index);
            });
    }
    template <class F>
    int Try(F const& f)
    {
        try {
            f();
        } catch (Broken const& broken) {
            log.push_back("report " + broken.text);
            return 3;
        } catch (int code) {
            return code;
        }
        return 0;
    }
    // What came, if it arrived, or what leaves, if all went well; else it goes with what the edit threw.
    template <class F>
    void OrDelete(Twin* node, F const& f)
    {
        try {
            f();
        } catch (...) {
            if (node && !node->parent) Delete(node);
            throw;
        }
    }

    void SetParent(Twin* node, Twin* group)
    {
        node->parent = group;
        while (group->parent) group = group->parent;
        for (Twin* const leaf : Of("l", node)) leaf->scale = group->scale;
    }
    static std::size_t PlaceOf(Twin const* group, Twin const* child)
    {
        return static_cast<std::size_t>(std::ranges::find(group->children, child) - group->children.begin());
    }
    static bool IsIn(Twin const* group, Twin const* child) { return PlaceOf(group, child) < group->children.size(); }
    static bool CanStore(Twin const* group, Twin const* child)
    {
        return std::ranges::count(group->Layout(), child->kind) > 0;
    }
    // The slots of a named group in the order of their names.
    static std::vector<std::size_t> Sorted(Twin const* group)
    {
        std::vector<std::size_t> slots(group->children.size());
        std::iota(slots.begin(), slots.end(), 0U);
        std::ranges::sort(slots, std::less<>(), [&](std::size_t i) { return ::Name(group->Layout()[i].c_str()); });
        return slots;
    }
    // Where a child stands in the eyes of those who hear of its removal.
    static std::size_t Rank(Twin const* group, Twin const* child)
    {
        std::size_t rank = 0;
        if (group->Shape() == 'i') return PlaceOf(group, child);
        for (std::size_t const i : Sorted(group)) {
            if (group->children[i] == child) break;
            rank += group->children[i] != &Hole;
        }
        return rank;
    }

    void Delete(Twin* node)
    {
        if (!node) return;
        if (node->Shape() == 'n') Empty(node);
        while (node->Shape() == 'i' && !node->children.empty()) Delete(Remove(node, node->children.size() - 1));
        Tell(node, [&] { return "destroyed " + Label(node); });
        delete node;
    }
    void Empty(Twin* group)
    {
        for (std::size_t const i : Sorted(group)) {
            Twin* const child = group->children[i];
            if (!child || child == &Hole) continue;
            std::size_t const rank = Rank(group, child);
            Tell(group, "before-remove", child, rank);
            child->parent = nullptr;
            Tell(group, "after-remove", child, rank);
            group->children[i] = nullptr;
            Delete(child);
        }
    }
    void Reset(Twin* group)
    {
        Empty(group);
        FillIn(group);
    }

    void SetFlags(Twin* node, unsigned int value, unsigned int mask)
    {
        unsigned int const old = node->flags;
        node->flags = (value & mask) | (old & ~mask);
        if (node->flags != old)
            Tell(node, [&] {
                return "flags " + Label(node) + " " + std::to_string(old) + " " + std::to_string(node->flags);
            });
    }
    void SetName(Twin* node, std::string const& name)
    {
        node->name = name;
        SetFlags(node, 0, 0x40000);
        Tell(node, [&] { return "name " + Label(node); });
    }
    void SetValue(Twin* leaf, double value)
    {
        leaf->value = value;
        Tell(leaf, [&] { return "value " + Label(leaf); });
    }
    void SetIndependent(Twin* node, bool on)
    {
        if (node->Shape() != 'l' && ((node->flags & 0x40) != 0) == on) return;
        for (std::size_t i = 0; i < node->children.size(); ++i)
            if (node->children[i]) SetIndependent(node->children[i], on);
        SetFlags(node, on ? 0x40 : 0, 0x40);
    }

    void Insert(Twin* list, std::size_t at, Twin* made)
    {
        OrDelete(
            made,
            [&] {
                if (!CanStore(list, made))
                    throw Broken{"There was an error reading the " + list->name +
                                 " parameter group. The project file is corrupt. Skipping the layer."};
                if (at > list->children.size()) throw Broken{"invalid index for insert in indexed group"};
                Twin const* const next = at < list->children.size() ? list->children[at] : nullptr;
                Tell(list, "before-insert", made, at);
                std::size_t place = next ? PlaceOf(list, next) : list->children.size();
                if (next && place == list->children.size()) place = std::min(at, place);
                list->children.insert(list->children.begin() + static_cast<std::ptrdiff_t>(place), made);
                SetParent(made, list);
                Tell(list, "after-insert", made, place);
            });
    }
    void Append(Twin* list, Twin* made) { Insert(list, list->children.size(), made); }
    void Duplicate(Twin* list, std::size_t at)
    {
        if (at >= list->children.size()) throw Broken{"invalid index in indexed group"};
        Insert(list, at + 1, Clone(list->children[at]));
    }
    Twin* Remove(Twin* list, std::size_t at)
    {
        if (at >= list->children.size()) throw Broken{"invalid index for remove in indexed group"};
        Twin* const child = list->children[at];
        Tell(list, "before-remove", child, at);
        if (!IsIn(list, child)) return nullptr;
        std::size_t const place = PlaceOf(list, child);
        list->children.erase(list->children.begin() + static_cast<std::ptrdiff_t>(place));
        child->parent = nullptr;
        OrDelete(child, [&] { Tell(list, "after-remove", child, place); });
        return child;
    }
    bool RemoveChild(Twin* from, Twin* child)
    {
        Tell(from, "before-remove", child, Rank(from, child));
        if (!IsIn(from, child)) return false;
        child->parent = nullptr;
        Tell(from, "after-remove", child, Rank(from, child));
        if (!IsIn(from, child)) return false;
        auto const place = from->children.begin() + static_cast<std::ptrdiff_t>(PlaceOf(from, child));
        if (from->Shape() == 'n')
            *place = &Hole;
        else
            from->children.erase(place);
        return true;
    }
    void Move(Twin* list, std::size_t from, std::size_t to)
    {
        if (from == list->children.size()) throw Broken{"invalid index in indexed group"};
        Twin* const child = list->children[from];
        auto const told = [&](char const* what) {
            Tell(list, [&] {
                std::string line = what + (" " + Label(list)) + " ";
                return (line += Label(child)) + " " + std::to_string(from) + " " + std::to_string(to);
            });
        };
        bool const isPlace = to < list->children.size();
        told("before-reorder");
        bool const was = std::exchange(paused_, true);
        int const code = Try([&] {
            Remove(list, PlaceOf(list, child));
            if (isPlace) to = std::min(to, list->children.size());
            Insert(list, to, child);
        });
        paused_ = was;
        if (code != 0) throw int{code};
        told("after-reorder");
    }

    void TellOfSwap(Twin* group, Twin* made, Twin* child, std::size_t index)
    {
        bool const tied = made && (made->flags & 0x40) != 0;
        if (tied) SetIndependent(made, false);
        auto const restore = [&] {
            if (tied && IsIn(group, made) && (made->flags & 0x40) == 0) SetIndependent(made, true);
        };
        try {
            Tell(group, "after-swap", child, index);
        } catch (...) {
            restore();
            throw;
        }
        restore();
    }
    Twin* Swap(Twin* list, std::size_t at, Twin* made)
    {
        Twin* old = nullptr;
        OrDelete(made, [&] {
            if (at >= list->children.size()) throw Broken{"invalid index for swap in indexed group"};
            if (!CanStore(list, made)) throw Broken{"invalid name for storing in this named group"};
            old = list->children[at];
            Tell(list, "before-swap", made, at);
            if (!IsIn(list, old)) throw Broken{"invalid index for swap in indexed group"};
            std::size_t const place = PlaceOf(list, old);
            SetParent(made, list);
            list->children[place] = made;
            old->parent = nullptr;
            OrDelete(old, [&] { TellOfSwap(list, made, made, place); });
        });
        return old;
    }
    // A null `made` is the canonical one.
    Twin* SwapSlot(Twin* group, std::size_t slot, Twin* made)
    {
        Tell(group, "before-swap", made, slot);
        Twin* const old = std::exchange(group->children[slot], made);
        if (made) SetParent(made, group);
        if (old) old->parent = nullptr;
        OrDelete(old, [&] { TellOfSwap(group, made, old, slot); });
        return old;
    }
    Twin* SwapNamed(Twin* group, Twin* made)
    {
        Twin* old = nullptr;
        OrDelete(made, [&] {
            auto const found = std::ranges::find(group->Layout(), made->kind);
            if (!CanStore(group, made)) throw Broken{"invalid name for storing in this named group"};
            old = SwapSlot(group, static_cast<std::size_t>(found - group->Layout().begin()), made);
        });
        return old;
    }
    Twin* SwapCanonical(Twin* group, std::size_t slot)
    {
        return group->children[slot] ? SwapSlot(group, slot, nullptr) : nullptr;
    }
    void Upgrade(Twin* group, std::size_t slot, unsigned int form)
    {
        if (form == 7) throw Broken{"stream at index has wrong matchname"};
        if (group->children[slot]) return;
        Twin* const replaced = SwapNamed(group, Make(group->Layout()[slot], false));
        bool const isReal = group->children[slot] != nullptr;
        Delete(replaced);
        if (!isReal) throw Broken{"unexpected match name searched for in group"};
    }
    void CopyFrom(Twin* group, Twin* other)
    {
        for (std::size_t const i : Sorted(other))
            if (Twin* const source = other->children[i]; source && CanStore(group, source))
                Delete(SwapNamed(group, Clone(source)));
    }

    static inline Twin Hole;
    int lastId_ = 0;
    bool paused_ = false;
};
