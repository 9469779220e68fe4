// JSON text of trees. The library for JSON does lexing and escaping; trees are built and written here, so that order
// and repeated keys stay, and depth is bounded on both ways.
#include "frame/services/anyvalue.h"

#include <nlohmann/json.hpp>

#include <algorithm>
#include <limits>
#include <vector>

namespace {

using Json = nlohmann::json;

// ---- writing

void AppendText(std::string& out, u16str const& text)
{
    out += Json(Q_UTF16ToMBString(text)).dump();
}

void AppendValue(std::string& out, Q_Any const& value)
{
    if (value.IsEmpty())
        out += "null";
    else if (value.IsNumber())
        out += std::to_string(value.GetAs_int());
    else
        AppendText(out, value.GetAs_Str());
}

bool IsArray(Q_AnyTree const& tree)
{
    return !tree.empty() && tree.data().IsEmpty() &&
           std::all_of(
               tree.begin(), tree.end(), [](auto const& child) { return child.first.empty(); });
}

void AppendContainer(std::string& out, Q_AnyTree const& tree, int depth)
{
    if (depth > Q_MaxJsonDepth) throw Q_Err_BadJson;
    bool const isArray = IsArray(tree);
    char separator = isArray ? '[' : '{';
    auto const beginMember = [&](u16str const& key) {
        out += std::exchange(separator, ',');
        if (isArray) return;
        AppendText(out, key);
        out += ':';
    };
    if (!tree.data().IsEmpty()) {
        beginMember(Q_MixedValueKey());
        AppendValue(out, tree.data());
    }
    for (auto const& [key, child] : tree) {
        beginMember(key);
        if (child.empty())
            AppendValue(out, child.data());
        else
            AppendContainer(out, child, depth + 1);
    }
    if (separator != ',') out += separator;  // nothing was in it
    out += isArray ? ']' : '}';
}

// ---- reading

// Builds the tree while the text is read. The functions' names and results are the library's: false ends the reading.
class TreeBuilder : public nlohmann::json_sax<Json> {
public:
    explicit TreeBuilder(Q_AnyTree& root) : mixedKey_(Q_MixedValueKey()) { open_.push_back({&root, {}}); }

    bool null() override { return Value(Q_Any()); }
    bool boolean(bool value) override { return Value(Q_Any(std::int64_t{value})); }
    bool number_integer(std::int64_t value) override { return Value(Q_Any(value)); }
    bool number_unsigned(std::uint64_t value) override
    {
        if (value > std::uint64_t{std::numeric_limits<std::int64_t>::max()}) return false;
        return Value(Q_Any(static_cast<std::int64_t>(value)));
    }
    bool number_float(double, std::string const&) override { return false; }
    bool string(std::string& value) override { return Value(Q_Any(Q_MBToUTF16String(value))); }
    bool binary(Json::binary_t&) override { return false; }

    bool start_object(std::size_t) override { return Begin(); }
    bool start_array(std::size_t) override { return Begin(); }
    bool end_object() override { return End(); }
    bool end_array() override { return End(); }
    bool key(std::string& text) override
    {
        open_.back().key = Q_MBToUTF16String(text);
        return true;
    }
    bool parse_error(std::size_t, std::string const&, Json::exception const&) override { return false; }

private:
    // A container that is being filled, and the key of its next child; the first stands around the root.
    struct Open {
        Q_AnyTree* tree;
        u16str key;
    };

    Q_AnyTree& Add(Q_Any const& value)
    {
        Open& parent = open_.back();
        return parent.tree->push_back({std::move(parent.key), Q_AnyTree(value)})->second;
    }

    bool Value(Q_Any const& value)
    {
        if (open_.size() == 1) return false;  // a bare value isn't a tree
        Open& parent = open_.back();
        if (parent.key == mixedKey_ && parent.tree->empty() && parent.tree->data().IsEmpty())
            parent.tree->data() = value;
        else
            Add(value);
        parent.key.clear();
        return true;
    }

    bool Begin()
    {
        if (open_.size() > Q_MaxJsonDepth) return false;
        Q_AnyTree* const tree = open_.size() == 1 ? open_.back().tree : &Add(Q_Any());
        open_.back().key.clear();
        open_.push_back({tree, {}});
        return true;
    }

    bool End()
    {
        open_.pop_back();
        return true;
    }

    u16str mixedKey_;
    std::vector<Open> open_;
};

}  // namespace

u16str Q_AnyTreeWrapper::GetAs_JSON() const
{
    std::string text;
    AppendContainer(text, *tree_, 1);
    return Q_MBToUTF16String(text);
}

void Q_AnyTreeWrapper::SetFrom_JSON_HackRecoverMagicMixed(u16str const& text)
{
    // The parser takes a NUL for the end of the text.
    if (text.find(u16str::value_type{0}) != u16str::npos) throw Q_Err_BadJson;
    Q_AnyTree tree;
    TreeBuilder builder(tree);
    if (!Json::sax_parse(Q_UTF16ToMBString(text), &builder)) throw Q_Err_BadJson;
    tree_->swap(tree);
}
