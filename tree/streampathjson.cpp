// Without it boost::none is an object that is made when the library loads, and nothing but frame/statics.cpp may do that.
#define BOOST_OPTIONAL_USE_OLD_DEFINITION_OF_NONE
#include "frame/services/anyvalue.h"
#include "tree/streampath.h"

#include <cstdint>

namespace {

constexpr char const* IndexKey = "index";
constexpr char const* MatchNameKey = "matchName";
constexpr int MaxKeyWidth = 31;

Q_Any const& Entry(Q_AnyTree const& component, char const* key)
{
    auto const found = component.find(Q_AsciiToUTF16String(key));
    if (found == component.not_found()) throw int{Q_Err_NoChild};
    return found->second.data();
}

unsigned int Index(Q_Any const& value)
{
    std::int64_t const index = value.GetAs_int();
    if (index < 0 || index > std::int64_t{KFS_StreamID::NoIndex}) throw int{Q_Err_NotANumber};
    return static_cast<unsigned int>(index);
}

// Adds a component for each child of the root. The keys don't matter, their order does.
class CCreatePath {
public:
    explicit CCreatePath(KFS_StreamIDPath* path) : path_(path) {}
    bool operator()(int, u16str const&, Q_AnyTree const& component, Q_Any const&)
    {
        unsigned int const index = Index(Entry(component, IndexKey));  // first: a name stays in the pool for good
        KFS_MatchName const name(Q_UTF16To8String(Entry(component, MatchNameKey).GetAs_Str()), true);
        path_->AddTail(KFS_StreamID(index, name));
        return false;
    }

private:
    KFS_StreamIDPath* path_;
};

}  // namespace

u16str KFS_StreamIDPath::GetAs_JSON() const
{
    int const width = static_cast<int>(Q_Any(std::int64_t{GetLength()}).GetAs_Str().size());
    Q_AnyTree tree;
    Q_AnyTreeWrapper root(tree);
    for (unsigned int i = 0; i < GetLength(); ++i) {
        KFS_StreamID const& id = components_[i];
        Q_AnyTree entries;
        Q_AnyTreeWrapper component(entries);
        component.put(Q_AsciiToUTF16String(IndexKey), Q_Any(std::int64_t{id.GetIndex()}));
        component.put(Q_AsciiToUTF16String(MatchNameKey), Q_Any(Q_MatchNameToUTF16String(id.GetMatchName().GetName())));
        root.put(hearth::string::NumberToString(i, width, 0, hearth::string::NumberFlag_ZeroPad, MaxKeyWidth), entries);
    }
    return root.GetAs_JSON();
}

void KFS_StreamIDPath::SetFrom_JSON(u16str const& text)
{
    Q_AnyTree tree;
    Q_AnyTreeWrapper root(tree);
    root.SetFrom_JSON_HackRecoverMagicMixed(text);
    KFS_StreamIDPath read;
    root.for_each(CCreatePath(&read));
    AddTail(read);
}
