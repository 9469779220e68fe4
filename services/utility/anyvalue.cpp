#include "frame/services/anyvalue.h"

#include <charconv>

u16str Q_Any::GetAs_Str() const
{
    if (u16str const* const text = std::get_if<u16str>(&value_)) return *text;
    if (std::int64_t const* const number = std::get_if<std::int64_t>(&value_))
        return Q_AsciiToUTF16String(std::to_string(*number).c_str());
    return {};
}

std::int64_t Q_Any::GetAs_int() const
{
    if (std::int64_t const* const number = std::get_if<std::int64_t>(&value_)) return *number;
    std::string const digits = Q_UTF16ToMBString(GetAs_Str());
    char const* const end = digits.data() + digits.size();
    std::int64_t number = 0;
    std::from_chars_result const result = std::from_chars(digits.data(), end, number);
    if (result.ec != std::errc() || result.ptr != end) throw Q_Err_NotANumber;
    return number;
}

u16str Q_MixedValueKey()
{
    return Q_AsciiToUTF16String("$value");
}

void Q_AnyTreeWrapper::put(u16str const& key, Q_AnyTree const& subTree)
{
    Q_AnyTree::assoc_iterator const present = tree_->find(key);
    if (present == tree_->not_found())
        tree_->push_back({key, subTree});
    else
        present->second = subTree;
}

void Q_AnyTreeWrapper::put(u16str const& key, Q_Any const& value)
{
    put(key, Q_AnyTree(value));
}

Q_Any const& Q_AnyTreeWrapper::get_child_any(u16str const& key) const
{
    Q_AnyTree const& tree = *tree_;
    Q_AnyTree::const_assoc_iterator const child = tree.find(key);
    if (child == tree.not_found()) throw Q_Err_NoChild;
    return child->second.data();
}
