#pragma once

#include "frame/frame.h"
#include "host/session.h"
#include "keystore/edit.h"
#include "keystore/stream.h"
#include "tree/factory.h"
#include "tree/indexedgroup.h"
#include "tree/namedgroup.h"

#include <benchmark/benchmark.h>

#include <memory>
#include <stdexcept>
#include <string>

// A tree of many nodes of which one in a hundred is edited.

namespace panels {

// A root of panels. A panel and its leaves are a hundred nodes, and one leaf of each panel is edited.
inline constexpr int Slots = 99;
inline constexpr int Keys = 16;
inline constexpr std::size_t KeySize = 48;
inline constexpr unsigned int Scale = 600;

[[noreturn]] inline void Stop(std::string const& what)
{
    throw std::runtime_error(what);
}
inline void Check(int code)
{
    if (code != 0) Stop("error " + std::to_string(code));
}

// ---- the kinds of the tree

inline KFS_MatchName LeafName(int slot)
{
    return {("Bench Leaf " + std::to_string(slot)).c_str(), true};
}
inline KFS_MatchName PanelName()
{
    return {"Bench Panel", true};
}
inline KFS_MatchName RootName()
{
    return {"Bench Root", true};
}

inline KFS_StreamBase* MakeLeaf(KFS_MatchName const& name, KFS_StreamFactory* factory, bool constant,
                                unsigned int scale, bool canonical)
{
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    return new KFS_Stream(1, scale, constant, false, KFS_InterpMask_All, 0, desc, &name, factory, canonical);
}

class Panel final : public KFS_NamedStreamGroup {
public:
    Panel(KFS_StreamFactory* factory, bool canonical) : KFS_NamedStreamGroup(&Name(), factory, canonical) {}
    Panel(Panel const& source, KFS_CloneStreamParams const& params) : KFS_NamedStreamGroup(source, params) {}
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override { return new Panel(*this, params); }
    void FillCanonicalLayout(KFS_CanonicalLayout* layout) override
    {
        for (int slot = 0; slot < Slots; ++slot) layout->push_back(GetFactory()->GetCanonicalStream(LeafName(slot)));
    }

private:
    static KFS_MatchName const& Name()
    {
        static KFS_MatchName const name = PanelName();
        return name;
    }
};

class Root final : public KFS_IndexedStreamGroup {
public:
    explicit Root(bool canonical = false) : KFS_IndexedStreamGroup(&Name(), Get_VX_StreamFactory(), canonical) {}
    Root(Root const& source, KFS_CloneStreamParams const& params) : KFS_IndexedStreamGroup(source, params) {}
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override { return new Root(*this, params); }
    void FillCanonicalLayout(KFS_CanonicalLayout* layout) override
    {
        layout->push_back(GetFactory()->GetCanonicalStream(PanelName()));
    }

private:
    static KFS_MatchName const& Name()
    {
        static KFS_MatchName const name = RootName();
        return name;
    }
};

// Never ended: streams and what is current on a thread go in an order of their own at exit.
inline void StartLibrary()
{
    static kfshost::Session* const session = [] {
        auto* const started = new kfshost::Session;
        KFS_StreamFactory* const factory = Get_VX_StreamFactory();
        for (int slot = 0; slot < Slots; ++slot) factory->RegisterFactoryFunc(LeafName(slot), MakeLeaf, false);
        factory->RegisterFactoryFunc(
            PanelName(),
            [](KFS_MatchName const&, KFS_StreamFactory* of, bool, unsigned int, bool canonical) {
                return new Panel(of, canonical);
            },
            false);
        factory->RegisterFactoryFunc(
            RootName(),
            [](KFS_MatchName const&, KFS_StreamFactory*, bool, unsigned int, bool canonical) {
                return new Root(canonical);
            },
            false);
        return started;
    }();
    benchmark::DoNotOptimize(session);
}

inline int SlotOf(int panel)
{
    return panel * 37 % Slots;
}

inline void Edit(Panel& panel, int slot, double value)
{
    KFS_Stream& leaf = *panel.GetEditableStream(static_cast<unsigned int>(slot))->GetAsLeaf();
    Check(leaf.SetConstant(false, false));
    for (int key = 0; key < Keys; ++key) {
        T_Time const at{key * 25, Scale};
        double const number = value + key * 0.375;
        Check(KFS_InsertKeyF(&leaf, &at, 1, &number, KFS_Interp_Linear, KFS_Interp_Linear));
    }
}

inline int PanelsOf(int nodes)
{
    return nodes / (Slots + 1);
}

inline std::unique_ptr<Root> Build(int nodes)
{
    auto root = std::make_unique<Root>();
    for (int i = 0; i < PanelsOf(nodes); ++i) {
        auto made = std::make_unique<Panel>(root->GetFactory(), false);
        Panel& panel = *made;
        Q_ScAutoPtr<KFS_StreamBase> stream(made.release());
        root->AppendStream(&stream);
        Edit(panel, SlotOf(i), i * 0.5);
    }
    return root;
}

}  // namespace panels
