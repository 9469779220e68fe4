#pragma once

#include "frame/boundary_private.h"
#include "frame/frame.h"
#include "keystore/edit.h"
#include "keystore/paramstreams.h"
#include "tree/factory.h"
#include "tree/indexedgroup.h"
#include "tree/namedgroup.h"

#include <memory>
#include <vector>

// Kinds of streams that a host may have and ours hasn't, in a tree of all sorts:
//
//   root      named    list, effect, path, kept
//   list      indexed  effects and leaves, any number
//   effect    named    slider, mask, layer, whole number

namespace fuzzkinds {

// A leaf of a type that files can't change: so many components, a path or not, and a parameter of some kind.
struct LeafKind {
    char const* name;
    short dimension;
    bool spatial;
    FX_ParamKind paramType;
};

inline constexpr LeafKind LeafKinds[] = {
    {"path", 3, true, FX_Param_POINT_3D},
    {"slider", 1, false, FX_Param_FLOAT_SLIDER},
    {"mask", 1, false, FX_Param_PATH},
    {"kept", 2, false, FX_Param_ALWAYS_SAVED},
    {"whole number", 1, false, FX_Param_INT_SLIDER},
};

class Leaf final : public KFS_Stream {
public:
    Leaf(LeafKind const& kind, KFS_StreamFactory* factory, bool constant, unsigned int timeScale, bool canonical)
        : KFS_Stream(kind.dimension, timeScale, constant, kind.spatial, KFS_InterpMask_All,
                     kind.spatial ? KFS_InterpMask_Negative : 0, Doubles(), NameOf(kind).get(), factory, canonical),
          kind_(kind)
    {
        InsertDefaultKey(T_Time{0, timeScale});
    }
    Leaf(Leaf const& source, KFS_CloneStreamParams const& params) : KFS_Stream(source, params), kind_(source.kind_) {}

    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override { return new Leaf(*this, params); }
    void FillInDisplayName() const override { pSetDisplayName(GetMatchName16Str()); }
    void FillInParamDef() const override
    {
        FX_ParamDef def{};
        def.paramType = kind_.paramType;
        pSetParamDef(def);
    }
    void InsertDefaultKey(T_Time const& time) override
    {
        double const zeros[3] = {};
        KFSp_ThrowIf(KFS_InsertKeyF(this, &time, 1, zeros, 0, 0));
    }

private:
    static std::unique_ptr<KFS_MatchName> NameOf(LeafKind const& kind)
    {
        return std::make_unique<KFS_MatchName>(kind.name, true);
    }
    static KFS_ValueDesc Doubles()
    {
        KFS_ValueDesc desc;
        desc.dataType = KFS_Type_Double;
        return desc;
    }

    LeafKind const& kind_;
};

// A group of one of two forms whose children are these kinds.
template <class Base>
class Group final : public Base {
public:
    Group(KFS_MatchName const& name, KFS_StreamFactory* factory, bool canonical, std::vector<char const*> kinds)
        : Base(&name, factory, canonical),
          kinds_(std::move(kinds))
    {}
    Group(Group const& source, KFS_CloneStreamParams const& params) : Base(source, params), kinds_(source.kinds_) {}

    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override { return new Group(*this, params); }
    void FillInDisplayName() const override { this->pSetDisplayName(this->GetMatchName16Str()); }
    bool CouldGoMissing() const override { return true; }
    void FillCanonicalLayout(KFS_CanonicalLayout* layout) override
    {
        for (char const* const kind : kinds_)
            layout->push_back(this->GetFactory()->GetCanonicalStream(KFS_MatchName(kind, true)));
    }

private:
    std::vector<char const*> kinds_;
};

// The kinds, registered for as long as this object lives.
class TreeKinds {
public:
    TreeKinds() : batch_(Get_VX_StreamFactory())
    {
        for (LeafKind const& kind : LeafKinds) {
            batch_.Register(
                KFS_MatchName(kind.name, true),
                [&kind](KFS_MatchName const&, KFS_StreamFactory* factory, bool constant, unsigned int timeScale,
                        bool canonical) { return new Leaf(kind, factory, constant, timeScale, canonical); },
                false);
        }
        batch_.Register(
            KFS_MatchName("layer", true),
            [](KFS_MatchName const& name, KFS_StreamFactory* factory, bool constant, unsigned int timeScale,
               bool canonical) { return new KFS_ParamLayerStream(timeScale, constant, &name, factory, canonical); },
            false);
        Register<KFS_NamedStreamGroup>("effect", {"slider", "mask", "layer", "whole number"});
        Register<KFS_IndexedStreamGroup>("list", {"effect", "path", "layer", "kept"});
        Register<KFS_NamedStreamGroup>("root", {"list", "effect", "path", "kept"});
    }
    ~TreeKinds() { batch_.UnregisterAll(); }
    TreeKinds(TreeKinds const&) = delete;
    TreeKinds& operator=(TreeKinds const&) = delete;

    static std::unique_ptr<KFS_StreamBase> MakeRoot() { return Make("root"); }
    static std::unique_ptr<KFS_StreamBase> Make(char const* name)
    {
        return std::unique_ptr<KFS_StreamBase>(
            Get_VX_StreamFactory()->CreateStream(KFS_MatchName(name, true), true, 600, false, false));
    }

private:
    template <class Base>
    void Register(char const* name, std::vector<char const*> const& kinds)
    {
        batch_.Register(
            KFS_MatchName(name, true),
            [kinds](KFS_MatchName const& kind, KFS_StreamFactory* factory, bool, unsigned int, bool canonical) {
                return new Group<Base>(kind, factory, canonical, kinds);
            },
            false);
    }

    KFS_ScRegisterStreams batch_;
};

}  // namespace fuzzkinds
