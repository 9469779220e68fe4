#include "frame/report_private.h"

#include "frame/services/reports.h"

#include <algorithm>
#include <array>
#include <cstdio>

namespace {

// How the sentence of a code is filled.
enum class Fill {
    ActionRow,  // "%s" takes the text of the row that the caller names
    Number,     // "%d" takes the number that the caller gives
    Nothing,    // reported as it stands, without formatting
};

struct ErrorRow {
    int code;
    short row;
    Fill fill;
};

constexpr std::array<ErrorRow, 13> ErrorRows{{
    {KFS_Err_DamagedStream, KFSp_Row_Damaged, Fill::ActionRow},
    {KFS_Err_KeyValue, KFSp_Row_KeyValue, Fill::ActionRow},
    {KFS_Err_Constant, KFSp_Row_Constant, Fill::ActionRow},
    {KFS_Err_NoKeys, KFSp_Row_NoKeys, Fill::ActionRow},
    {KFS_Err_TimeScale, KFSp_Row_TimeScale, Fill::ActionRow},
    {KFS_Err_TimeOverflow, KFSp_Row_TimeOverflow, Fill::ActionRow},
    {KFS_Err_TimeNotRepresentable, KFSp_Row_TimeNotRepresentable, Fill::ActionRow},
    {KFS_Err_InterpNotAllowed, KFSp_Row_InterpNotAllowed, Fill::Number},
    {KFS_Err_BadFileInfo, KFSp_Row_BadFileInfo, Fill::ActionRow},
    {KFS_Err_NotSpatial, KFSp_Row_NotSpatial, Fill::ActionRow},
    {KFS_Err_ArcLength2D, KFSp_Row_ArcLength2D, Fill::Nothing},
    {KFS_Err_Only2D3D, KFSp_Row_Only2D3D, Fill::Nothing},
    {KFS_Err_CustomNotAllowed, KFSp_Row_CustomNotAllowed, Fill::Nothing},
}};

// The format is a row of our own table, whose placeholder `value` fits.
template <class Value>
void FormatRow(short row, Value value)
{
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
#pragma GCC diagnostic ignored "-Wformat-security"
    std::snprintf(Qp_GetThreadLoggingBuffer(), Q_LoggingBufferSize, KFSp_MessageText(row), value);
#pragma GCC diagnostic pop
}

int RefuseCustom(int operation, short row, short what)
{
    Qp_SetThreadLastError(0);
    FormatRow(row, KFSp_MessageText(what));
    Qp_ReportError(KFSp_ReportId(operation), KFSp_Severity);
    return KFS_Err_CustomValue;
}

}  // namespace

int KFSp_ReportErr(int operation, int error, short argument)
{
    if (error == 0) return 0;
    auto const row =
        std::find_if(ErrorRows.begin(), ErrorRows.end(), [error](ErrorRow const& r) { return r.code == error; });
    if (row != ErrorRows.end() && row->fill == Fill::Nothing) return KFSp_ReportRow(operation, error, row->row);
    Qp_SetThreadLastError(0);
    if (row == ErrorRows.end())
        FormatRow(KFSp_Row_UnknownError, error);
    else if (row->fill == Fill::Number)
        FormatRow(row->row, static_cast<int>(argument));
    else
        FormatRow(row->row, KFSp_MessageText(argument));
    Qp_ReportError(KFSp_ReportId(operation), KFSp_Severity);
    return error;
}

int KFSp_ReportNumber(int operation, int error, short row, int number)
{
    Qp_SetThreadLastError(0);
    FormatRow(row, number);
    Qp_ReportError(KFSp_ReportId(operation), KFSp_Severity);
    return error;
}

int KFSp_ReportRow(int operation, int error, short row)
{
    Qp_ReportErrString(KFSp_ReportId(operation), KFSp_Severity, KFSp_MessageText(row));
    return error;
}

int KFSp_RefuseCustomValue(int operation, short what)
{
    return RefuseCustom(operation, KFSp_Row_CantCustomValue, what);
}

int KFSp_RefuseCustomInterpolation(int operation, short what)
{
    return RefuseCustom(operation, KFSp_Row_CustomInterpolation, what);
}
