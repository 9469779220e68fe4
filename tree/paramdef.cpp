#include "tree/paramdef.h"

#include "frame/report_private.h"
#include "frame/services/memory.h"

#include <string>

namespace {

constexpr unsigned int KindsWithParamName = 0x8090;  // bits 4, 7 and 15

char*& ParamNameField(FX_ParamDef* def)
{
    return def->paramType == FX_Param_CHOICE ? def->value.choice.paramName : def->value.named.paramName;
}

char const* ParamNameField(FX_ParamDef const* def)
{
    return def->paramType == FX_Param_CHOICE ? def->value.choice.paramName : def->value.named.paramName;
}

}  // namespace

u16str FX_ParamDef_GetName(FX_ParamDef const* def)
{
    return Q_MBToUTF16String(def->name);
}

void FX_ParamDef_SetName(FX_ParamDef* def, u16str const& name)
{
    std::string const text = Q_UTF16ToMBString(name, false);
    static_cast<void>(Q_CopyString(text.c_str(), sizeof def->name, def->name));
}

bool FX_ParamDef_HasParamName(FX_ParamDef const* def)
{
    auto const kind = static_cast<unsigned int>(def->paramType);
    return kind < 16 && ((KindsWithParamName >> kind) & 1U) != 0;
}

u16str FX_ParamDef_GetParamName(FX_ParamDef const* def)
{
    if (!FX_ParamDef_HasParamName(def) || !ParamNameField(def)) return {};
    return Q_MBToUTF16String(ParamNameField(def));
}

void FX_ParamDef_SetParamName(FX_ParamDef* def, u16str const& name, bool keepEmpty)
{
    if (!FX_ParamDef_HasParamName(def)) return;
    char*& field = ParamNameField(def);
    if (field) {
        Q_FreePtr(field);
        field = nullptr;
    }
    if (name.empty() && !keepEmpty) return;
    std::string const text = Q_UTF16ToMBString(name, false);
    std::size_t const size = text.size() + 1;
    auto* const buffer = static_cast<char*>(Q_AllocatePtr(KFSp_ModuleId, "paramdef name field", size));
    if (!buffer) throw int{KFS_Err_OutOfMemory};
    if (int const code = Q_CopyString(text.c_str(), static_cast<int>(size), buffer)) {
        Q_FreePtr(buffer);
        throw code;
    }
    field = buffer;
}

void FX_ParamDef_Copy(FX_ParamDef const& source, FX_ParamDef* target)
{
    if (&source == target) return;
    KFS_DeleteParamDefInternalString(target);
    *target = source;
    if (!FX_ParamDef_HasParamName(target)) return;
    ParamNameField(target) = nullptr;
    if (ParamNameField(&source)) FX_ParamDef_SetParamName(target, FX_ParamDef_GetParamName(&source), false);
}

void KFS_DeleteParamDefInternalString(FX_ParamDef* def)
{
    FX_ParamDef_SetParamName(def, u16str(), false);
}
