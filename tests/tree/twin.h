#pragma once

#include "tests/support/groups.h"

#include <functional>
#include <memory>
#include <set>

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
    return *std::find_if(
        TwinKinds.begin(), TwinKinds.end(), [&](TwinKind const& k) { return k.name == name; });
}

struct Broken {
    std::string text;
};

// Edits, as a script says them. Each number is taken modulo what there is.
enum class Op {
    Insert,
    Append,
    Swap,
    Remove,
    RemoveChild,
    Move,
    Duplicate,
    Upgrade,
    SwapNamed,
    Canonical,
    Reset,
    Copy,
    Flags,
    Name,
    Independent,
    Value,
    Throw,
    End
};
inline char const* const OpNames[] = {"Insert",    "Append",  "Swap",        "Remove",    "RemoveChild", "Move",
                                      "Duplicate", "Upgrade", "SwapNamed",   "Canonical", "Reset",       "Copy",
                                      "Flags",     "Name",    "Independent", "Value",     "Throw"};
struct Edit {
    Op op = Op::End;
    unsigned int group = 0, at = 0, to = 0;
};
inline char const* const Moments[] = {"never",       "before-insert", "after-insert",   "before-remove", "after-remove",
                                      "before-swap", "after-swap",    "before-reorder", "after-reorder"};
struct Step {
    Edit edit;
    unsigned int moment = 0;  // the first such notification of the edit makes a listener do `nested`
    Edit nested;
};

constexpr unsigned int TwinFlags[] = {0x1, 0x2, 0x8, 0x10, 0x20, 0x200, 0x1000, 0x2000, 0x20000, 0x40000, 0x80000};

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

class TwinTree {
public:
    TwinTree() : root(Make("list", false)) { root->scale = RootScale; }
    ~TwinTree() { Free(root); }
    TwinTree(TwinTree const&) = delete;
    TwinTree& operator=(TwinTree const&) = delete;

    // Every node below the root, the root first, depth first.
    std::vector<Twin*> Nodes(Twin* from) const
    {
        std::vector<Twin*> nodes{from};
        for (Twin* const child : from->children)
            if (child && child != &Hole)
                for (Twin* const node : Nodes(child)) nodes.push_back(node);
        return nodes;
    }
    std::vector<Twin*> Of(std::string const& shapes) const
    {
        std::vector<Twin*> nodes = Nodes(root);
        std::erase_if(nodes, [&](Twin* node) { return shapes.find(node->Shape()) == std::string::npos; });
        return nodes;
    }

    // The tree at a moment: names and identities; * for who isn't its parent's, ~ for what is canonical.
    std::string Show(Twin* node, Twin const* parent, bool whole, std::string const& path = {})
    {
        std::string text = Label(node) + (node->parent == parent ? "" : "*");
        if (whole) text += Facts(node) + " @" + path;
        if (node->Shape() == 'l') return text;
        text += "[";
        for (std::size_t i = 0; i < node->children.size(); ++i) {
            Twin* const child = node->children[i];
            std::string const kind = node->Shape() == 'n' ? node->Layout()[i] : child->kind;
            std::string const step = path + "/" + (node->Shape() == 'i' ? std::to_string(i) : "") + kind;
            text += child == &Hole ? "-" : child ? Show(child, node, whole, step) : kind + "~";
            text += ' ';
        }
        return text + "]";
    }

    void Do(Step const& step)
    {
        moment = Moments[step.moment];
        nested = step.nested;
        int const code = Try([&] { Do(step.edit, false); });
        if (code != 0) log.push_back("code " + std::to_string(code));
        moment = Moments[0];
        for (Twin* const gone : std::exchange(limbo, {})) Delete(gone);
    }

    // What a file says of a node: its kinds, flags and names.
    void Save(Twin const* node, std::string const& indent, std::vector<std::string>* lines, bool marked) const
    {
        auto const add = [&](char const* id, std::string const& data) {
            lines->push_back(indent + "  " + id + " " + data);
        };
        lines->push_back(indent + "LIST " + (node->Shape() == 'l' ? "kfbs" : "kfgp"));
        add("kfsb", std::to_string(node->flags & ~Unsaved));
        add("kfsn", marked ? "-_0_/-" : node->name);
        if (node->Shape() == 'l') return;
        for (Twin const* const child : node->children) {
            if (!child || !IsWritten(node, child)) continue;
            add("kfmn", child->kind);
            Save(child, indent + "  ", lines, node->Shape() == 'n' || child->name == child->kind);
        }
        add("kfmn", "ZQVM Group End");
    }

    // Makes `to`, which is as new, what a load of `from` makes of it.
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

    static bool IsModified(Twin const* node)
    {
        if (node->Shape() == 'l') return node->keyed || node->value != KindOf(node->kind).value;
        if (node->Shape() == 'i') return !node->children.empty();
        return std::any_of(node->children.begin(), node->children.end(),
                           [](Twin const* c) { return c && IsModified(c); });
    }
    static bool IsAnimated(Twin const* node)
    {
        return node->keyed ||
               std::any_of(
                   node->children.begin(), node->children.end(), [](Twin const* c) { return c && IsAnimated(c); });
    }

    static inline Twin Hole;
    static constexpr unsigned int RootScale = 30, Unsaved = 0x1D0EC;
    Twin* root;
    std::vector<Twin*> limbo;  // what the script's user owns
    std::vector<std::string> log;
    std::string moment = Moments[0];
    Edit nested;

    // A node as the factory makes it: subgroups are its own, and empty of real streams.
    Twin* Make(std::string const& kind, bool keyed) const
    {
        Twin* const made = MakeEmpty(kind);
        made->keyed = keyed && made->Shape() == 'l';
        if (made->Shape() == 'n') FillIn(made);
        return made;
    }

private:
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

    std::string Label(Twin* node)
    {
        if (node->id == 0) node->id = ++lastId_;
        return node->kind + "#" + std::to_string(node->id);
    }
    static std::string Facts(Twin const* node)
    {
        bool active = true, hidden = (node->flags & 2) != 0;
        int depth = 0;
        for (Twin const* up = node->parent; up; up = up->parent, ++depth) {
            active = active && (up->flags & 1) != 0;
            hidden = hidden || (up->flags & 2) != 0;
        }
        std::string text = "{" + std::to_string(node->flags) + " " + node->name + (active ? "" : " off") +
                           (hidden ? " hidden" : "") + (IsModified(node) ? " modified" : "") +
                           (IsAnimated(node) ? " animated" : "") + " " + std::to_string(depth);
        if (node->Shape() == 'l') text += " " + std::to_string(node->value) + " at " + std::to_string(node->scale);
        return text + "}";
    }

    static bool IsWritten(Twin const* group, Twin const* child)
    {
        return group->Shape() == 'i' || child->Shape() == 'n' || IsModified(child) || child->flags != 1 ||
               child->name != child->kind;
    }

    int Probe(Twin* node) const
    {
        if (node == root) return 1;
        if (node->heard != 0 || !node->parent) return node->heard;
        Twin* top = node->parent;
        while (top->parent) top = top->parent;
        return node->heard = Probe(top);
    }
    // The first line of its kind makes the listener act, if the script says so.
    template <class Who>
    void Tell(Twin* gate, std::string const& what, Who const& who)
    {
        if (paused_ || Probe(gate) != 1) return;
        log.push_back(what + " " + who());
        if (what == "destroyed" || what == "flags" || what == "name" || what == "value") return;
        log.back() += " in " + Show(root, nullptr, false);
        if (what != moment) return;
        moment = Moments[0];
        if (nested.op == Op::Throw) throw int{77};
        int const code = Try([&] { Do(nested, true); });
        if (code != 0) log.push_back("nested code " + std::to_string(code));
    }
    void Tell(Twin* group, std::string const& what, Twin* child, std::string const& kind, std::size_t index)
    {
        Tell(
            group, what,
            [&] {
                std::string who = Label(group) + " ";  // the group before the child: both may be new
                return (who += child ? Label(child) : kind + "~") + " " + std::to_string(index);
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

    static unsigned int ScaleAt(Twin const* group)
    {
        while (group->parent) group = group->parent;
        return group->scale;
    }
    void SetParent(Twin* node, Twin* group) const
    {
        node->parent = group;
        unsigned int const scale = ScaleAt(group);
        for (Twin* const each : Nodes(node))
            if (each->Shape() == 'l') each->scale = scale;
    }
    static std::size_t PlaceOf(Twin const* group, Twin const* child)
    {
        return static_cast<std::size_t>(std::find(group->children.begin(), group->children.end(), child) -
                                        group->children.begin());
    }
    static std::ptrdiff_t Sorted(Twin const* group, std::string const& kind)
    {
        std::ptrdiff_t rank = 0;
        for (std::size_t i = 0; i < group->children.size(); ++i)
            rank += group->children[i] != &Hole && ::Name(group->Layout()[i].c_str()) < ::Name(kind.c_str());
        return rank;
    }

    void Delete(Twin* node)
    {
        if (!node) return;
        if (node->Shape() == 'n') Empty(node);
        while (node->Shape() == 'i' && !node->children.empty()) {
            Twin* const child = node->children.back();
            Tell(node, "before-remove", child, "", node->children.size() - 1);
            node->children.pop_back();
            child->parent = nullptr;
            Tell(node, "after-remove", child, "", node->children.size());
            Delete(child);
        }
        Tell(node, "destroyed", [&] { return Label(node); });
        delete node;
    }
    // The real children of a named group go in the order of their names.
    void Empty(Twin* group)
    {
        std::vector<std::pair<KFS_MatchName, std::size_t>> order;
        for (std::size_t i = 0; i < group->children.size(); ++i)
            order.emplace_back(::Name(group->Layout()[i].c_str()), i);
        std::sort(order.begin(), order.end());
        for (auto const& [name, i] : order) {
            Twin* const child = group->children[i];
            if (!child || child == &Hole) continue;
            auto const rank = static_cast<std::size_t>(Sorted(group, child->kind));
            Tell(group, "before-remove", child, "", rank);
            child->parent = nullptr;
            Tell(group, "after-remove", child, "", rank);
            group->children[i] = nullptr;
            Delete(child);
        }
    }
    void SetFlags(Twin* node, unsigned int value, unsigned int mask)
    {
        unsigned int const old = node->flags;
        node->flags = (value & mask) | (old & ~mask);
        if (node->flags != old)
            Tell(node, "flags",
                 [&] { return Label(node) + " " + std::to_string(old) + " " + std::to_string(node->flags); });
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
        if (std::find(list->Layout().begin(), list->Layout().end(), made->kind) == list->Layout().end())
            throw Broken{"There was an error reading the " + list->name +
                         " parameter group. The project file is corrupt. Skipping the layer."};
        if (at > list->children.size()) throw Broken{"invalid index for insert in indexed group"};
        Twin const* const next = at < list->children.size() ? list->children[at] : nullptr;
        Tell(list, "before-insert", made, "", at);
        std::size_t place = next ? PlaceOf(list, next) : list->children.size();
        if (next && place == list->children.size()) place = std::min(at, place);
        list->children.insert(list->children.begin() + static_cast<std::ptrdiff_t>(place), made);
        SetParent(made, list);
        Tell(list, "after-insert", made, "", place);
    }
    // What came, if it arrived; else it goes with what the edit threw.
    template <class F>
    void Bring(Twin* made, F const& f)
    {
        try {
            f();
        } catch (...) {
            if (!made->parent) Delete(made);
            throw;
        }
    }
    Twin* Remove(Twin* list, std::size_t at, char const* text = "invalid index for remove in indexed group")
    {
        if (at >= list->children.size()) throw Broken{text};
        Twin* const child = list->children[at];
        Tell(list, "before-remove", child, "", at);
        std::size_t const place = PlaceOf(list, child);
        if (place == list->children.size()) return nullptr;
        list->children.erase(list->children.begin() + static_cast<std::ptrdiff_t>(place));
        child->parent = nullptr;
        OrDelete(child, [&] { Tell(list, "after-remove", child, "", place); });
        return child;
    }
    template <class F>
    void OrDelete(Twin* leaving, F const& f)
    {
        try {
            f();
        } catch (...) {
            Delete(leaving);
            throw;
        }
    }
    void TellOfSwap(Twin* group, Twin* made, Twin* child, std::string const& kind, std::size_t index)
    {
        bool const tied = made && (made->flags & 0x40) != 0;
        if (tied) SetIndependent(made, false);
        auto const restore = [&] {
            if (tied && PlaceOf(group, made) < group->children.size() && (made->flags & 0x40) == 0)
                SetIndependent(made, true);
        };
        try {
            Tell(group, "after-swap", child, kind, index);
        } catch (...) {
            restore();
            throw;
        }
        restore();
    }
    Twin* Swap(Twin* list, std::size_t at, Twin* made)
    {
        if (at >= list->children.size()) throw Broken{"invalid index for swap in indexed group"};
        if (std::find(list->Layout().begin(), list->Layout().end(), made->kind) == list->Layout().end())
            throw Broken{"invalid name for storing in this named group"};
        Twin* const old = list->children[at];
        Tell(list, "before-swap", made, "", at);
        std::size_t const place = PlaceOf(list, old);
        SetParent(made, list);
        if (place == list->children.size()) {
            made->parent = nullptr;
            throw Broken{"invalid index for swap in indexed group"};
        }
        list->children[place] = made;
        old->parent = nullptr;
        OrDelete(old, [&] { TellOfSwap(list, made, made, "", place); });
        return old;
    }
    // A null `made` is the canonical one.
    Twin* SwapNamed(Twin* group, std::size_t slot, Twin* made)
    {
        std::string const& kind = group->Layout()[slot];
        Tell(group, "before-swap", made, kind, slot);
        Twin* const old = std::exchange(group->children[slot], made);
        if (made) SetParent(made, group);
        if (old) old->parent = nullptr;
        OrDelete(old, [&] { TellOfSwap(group, made, old, kind, slot); });
        return old;
    }
    void Upgrade(Twin* group, std::size_t slot)
    {
        if (group->children[slot]) return;
        Twin* const made = Make(group->Layout()[slot], false);
        Twin* replaced = nullptr;
        Bring(made, [&] { replaced = SwapNamed(group, slot, made); });
        bool const isReal = group->children[slot] != nullptr;
        Delete(replaced);
        if (!isReal) throw Broken{"unexpected match name searched for in group"};
    }
    void Own(Twin* node)
    {
        if (node) limbo.push_back(node);
    }

    void Do(Edit const& e, bool isNested);

    int lastId_ = 0;
    bool paused_ = false;
};

inline void TwinTree::Do(Edit const& e, bool isNested)
{
    std::vector<Twin*> const lists = Of("i"), named = Of("n"), nodes = Of("lni"), leaves = Of("l");
    Twin* const list = lists[e.group % lists.size()];
    Twin* const node = nodes[e.group % nodes.size()];
    Twin* const group = named.empty() ? nullptr : named[e.group % named.size()];
    std::size_t const count = list->children.size(), at = e.at % (count + 2);
    std::size_t const slot = group ? e.at % group->children.size() : 0;
    std::string const kind = TwinKinds[e.to % TwinKinds.size()].name;
    switch (e.op) {
    case Op::Insert:
    case Op::Append:
    case Op::Swap: {
        Twin* const made = Make(kind, e.to % 5 == 1);
        if (e.to % 7 == 2) SetIndependent(made, true);
        if (e.op == Op::Swap)
            Bring(made, [&] { Own(Swap(list, at, made)); });
        else
            Bring(made, [&] { Insert(list, e.op == Op::Append ? count : at, made); });
        break;
    }
    case Op::Remove: Own(Remove(list, at)); break;
    case Op::RemoveChild: {
        bool const isNamed = group && !isNested && e.to % 2 == 1;
        Twin* const from = isNamed ? group : list;
        if (from->children.empty()) break;
        std::size_t const place = e.at % from->children.size();
        Twin* const child = from->children[place];
        if (!child) break;
        auto const index = [&] {
            return isNamed ? static_cast<std::size_t>(Sorted(from, child->kind)) : PlaceOf(from, child);
        };
        Tell(from, "before-remove", child, "", index());
        if (PlaceOf(from, child) == from->children.size()) break;
        child->parent = nullptr;
        Tell(from, "after-remove", child, "", index());
        std::size_t const now = PlaceOf(from, child);
        if (now == from->children.size()) break;
        Own(child);
        if (isNamed) {
            moment = Moments[0];
            from->children[now] = &Hole;
            Empty(from);
            FillIn(from);
        } else {
            from->children.erase(from->children.begin() + static_cast<std::ptrdiff_t>(now));
        }
        break;
    }
    case Op::Move: {
        if (e.at % (count + 1) == count) throw Broken{"invalid index in indexed group"};
        Twin* const child = list->children[e.at % (count + 1)];
        std::size_t to = isNested ? e.to % count : e.to % (count + 1);
        auto const told = [&](char const* what) {
            Tell(list, what, [&] {
                std::string who = Label(list) + " ";
                return (who += Label(child)) + " " + std::to_string(e.at % (count + 1)) + " " + std::to_string(to);
            });
        };
        bool const isPlace = to < count;
        told("before-reorder");
        bool const was = std::exchange(paused_, true);
        bool lost = false;
        int const code = Try([&] {
            Remove(list, PlaceOf(list, child));
            if (isPlace) to = std::min(to, list->children.size());
            lost = to > list->children.size();
            if (lost) Delete(child);
            if (lost) throw Broken{"invalid index for insert in indexed group"};
            Insert(list, to, child);
        });
        paused_ = was;
        if (code != 0) throw int{code};
        told("after-reorder");
        break;
    }
    case Op::Duplicate: {
        if (at >= count) throw Broken{"invalid index in indexed group"};
        Twin* const copy = Clone(list->children[at]);
        Bring(copy, [&] { Insert(list, at + 1, copy); });
        break;
    }
    case Op::Upgrade:
        if (group && e.to % 8 == 7) throw Broken{"stream at index has wrong matchname"};
        if (group) Upgrade(group, slot);
        break;
    case Op::SwapNamed: {
        if (!group) break;
        Twin* const made = Make(e.to % 5 == 4 ? "list" : group->Layout()[slot], e.to % 2 == 1);
        if (e.to % 3 == 2) SetIndependent(made, true);
        auto const found = std::find(group->Layout().begin(), group->Layout().end(), made->kind);
        auto const where = static_cast<std::size_t>(found - group->Layout().begin());
        Bring(made, [&] {
            if (found == group->Layout().end()) throw Broken{"invalid name for storing in this named group"};
            Own(SwapNamed(group, where, made));
        });
        break;
    }
    case Op::Canonical:
        if (group && group->children[slot]) Own(SwapNamed(group, slot, nullptr));
        break;
    case Op::Reset:
        if (!group || isNested) break;
        moment = Moments[0];
        Empty(group);
        FillIn(group);
        break;
    case Op::Copy: {
        if (!group || isNested) break;
        moment = Moments[0];
        // Not from below the group itself, which may go with what is replaced.
        Twin* const other = named[e.at % named.size()];
        std::vector<Twin*> const below = Nodes(group);
        if (std::find(below.begin(), below.end(), other) != below.end()) break;
        std::vector<std::pair<KFS_MatchName, Twin*>> sources;
        for (Twin* const child : other->children)
            if (child) sources.emplace_back(::Name(child->kind.c_str()), child);
        std::sort(sources.begin(), sources.end());
        for (auto const& [name, source] : sources) {
            auto const found = std::find(group->Layout().begin(), group->Layout().end(), source->kind);
            if (found == group->Layout().end()) continue;
            Delete(SwapNamed(group, static_cast<std::size_t>(found - group->Layout().begin()), Clone(source)));
        }
        break;
    }
    case Op::Flags: {
        unsigned int const bit = TwinFlags[e.at % std::size(TwinFlags)];
        SetFlags(node, e.to % 2 == 1 ? bit : 0, bit);
        break;
    }
    case Op::Name:
        node->name = e.to % 3 == 0 ? node->kind : "name " + std::to_string(e.to % 4);
        SetFlags(node, 0, 0x40000);
        Tell(node, "name", [&] { return Label(node); });
        break;
    case Op::Independent: SetIndependent(node, e.to % 2 == 1); break;
    case Op::Value: {
        Twin* const leaf = leaves.empty() ? nullptr : leaves[e.group % leaves.size()];
        if (!leaf) break;
        leaf->value = e.to % 6;
        Tell(leaf, "value", [&] { return Label(leaf); });
        break;
    }
    case Op::Throw:
    case Op::End: break;
    }
}
