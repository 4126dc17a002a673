// Keys of the NAND information.
#pragma once

#include <string_view>

namespace tavrel {

/// The prefix of all keys.
inline constexpr std::string_view kNANDInfoKeyPrefix = "com.norvane.NANDInfo.";

// -- Fixed figures, in the order in which they are set ------------------------------------------

inline constexpr std::string_view kNANDInfoExportVersionKey = "com.norvane.NANDInfo.ExportVersion";
inline constexpr std::string_view kNANDInfoDriverVersionKey = "com.norvane.NANDInfo.DriverVersion";
inline constexpr std::string_view kNANDInfoDemoModeKey = "com.norvane.NANDInfo.DemoMode";

inline constexpr std::string_view kNANDInfoNumVirtualBlocksKey =
    "com.norvane.NANDInfo.NumVirtualBlocks";
inline constexpr std::string_view kNANDInfoPagesPerVirtualBlockKey =
    "com.norvane.NANDInfo.PagesPerVirtualBlock";
inline constexpr std::string_view kNANDInfoBytesPerPageKey = "com.norvane.NANDInfo.BytesPerPage";
inline constexpr std::string_view kNANDInfoNumLogicalReadsKey =
    "com.norvane.NANDInfo.NumLogicalReads";
inline constexpr std::string_view kNANDInfoNumLogicalWritesKey =
    "com.norvane.NANDInfo.NumLogicalWrites";
inline constexpr std::string_view kNANDInfoNumFreeVirtualBlocksKey =
    "com.norvane.NANDInfo.NumFreeVirtualBlocks";
inline constexpr std::string_view kNANDInfoNumWearLevelOpsKey =
    "com.norvane.NANDInfo.NumWearLevelOps";
inline constexpr std::string_view kNANDInfoNumPhysicalReadsKey =
    "com.norvane.NANDInfo.NumPhysicalReads";
inline constexpr std::string_view kNANDInfoNumPhysicalWritesKey =
    "com.norvane.NANDInfo.NumPhysicalWrites";
inline constexpr std::string_view kNANDInfoNumPhysicalErasesKey =
    "com.norvane.NANDInfo.NumPhysicalErases";
inline constexpr std::string_view kNANDInfoNumNodesFreeKey = "com.norvane.NANDInfo.NodesFree";
inline constexpr std::string_view kNANDInfoNumNodesTotalKey = "com.norvane.NANDInfo.NodesTotal";

/// Whole weeks since 2000, despite the key's name.
inline constexpr std::string_view kNANDInfoFormatWeeksSince2000Key =
    "com.norvane.NANDInfo.formatDaysSince2000";

inline constexpr std::string_view kNANDInfoNumSleepOpsKey = "com.norvane.NANDInfo.NumSleepOps";
inline constexpr std::string_view kNANDInfoHighEnduranceBlockEraseCountKey =
    "com.norvane.NANDInfo.HighEnduranceBlockEraseCount";
inline constexpr std::string_view kNANDInfoBlocksPerVirtualBlock =
    "com.norvane.NANDInfo.BlocksPerVirtualBlock";
inline constexpr std::string_view kNANDInfoReadsBeforeErasureKeys[] = {
    "com.norvane.NANDInfo.ReadsBeforeErasure0",
    "com.norvane.NANDInfo.ReadsBeforeErasure50000",
    "com.norvane.NANDInfo.ReadsBeforeErasure100000",
    "com.norvane.NANDInfo.ReadsBeforeErasure150000",
    "com.norvane.NANDInfo.ReadsBeforeErasure200000",
};

inline constexpr std::string_view kNANDInfoIntermediatePartitionSizeKey =
    "com.norvane.NANDInfo.IntermediatePartitionSize";
inline constexpr std::string_view kNANDInfoNumMaintenanceRequestsKey =
    "com.norvane.NANDInfo.NumMaintenanceRequests";
inline constexpr std::string_view kNANDInfoMaintenanceFailedReadKey =
    "com.norvane.NANDInfo.MaintenanceRequestsFailedRead";
inline constexpr std::string_view kNANDInfoMaintenanceFailedProgKey =
    "com.norvane.NANDInfo.MaintenanceRequestsFailedProg";
inline constexpr std::string_view kNANDInfoMaintenanceFailedEraseKey =
    "com.norvane.NANDInfo.MaintenanceRequestsFailedErase";

// -- Errors: a dictionary with the first key has no other entry than the message -----------------

inline constexpr std::string_view kNANDInfoErrorKey = "com.norvane.NANDInfo.Error";
inline constexpr std::string_view kNANDInfoErrorMessageKey = "com.norvane.NANDInfo.ErrorMessage";

// -- Writes of the virtual-memory freezer -------------------------------------------------------

inline constexpr std::string_view kNANDInfoVMFreezerNumPhysicalWritesKey =
    "com.norvane.NANDInfo.VMFreezer.NumPhysicalWrites";
inline constexpr std::string_view kNANDInfoVMFreezerErrorKey =
    "com.norvane.NANDInfo.VMFreezer.Error";
inline constexpr std::string_view kNANDInfoVMFreezerErrorMessageKey =
    "com.norvane.NANDInfo.VMFreezer.ErrorMessage";

}  // namespace tavrel
