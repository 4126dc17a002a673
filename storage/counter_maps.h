// The places of a NAND chip's counters in its 4 KiB block, by generation and maker.
//
// The block is read as little-endian words of 32 bits. A row assigns words `firstWord` to
// `lastWord`, in order, to elements `first` to `last` of an array. Elements without a row are 0.
#pragma once

#include <array>
#include <cstdint>

#include "storage/telemetry_counters.h"

namespace tavrel {

struct CounterRange {
  CounterArray array;
  std::uint16_t first, last;
  std::uint16_t firstWord, lastWord;
};

namespace counter_maps {

using enum CounterArray;

// clang-format off
/// Controllers of the first generation, with any chip.
inline constexpr auto kAlgoGenericMap = std::to_array<CounterRange>({
    {readStage, 0, 18, 0, 18},
    {readStage, 19, 19, 37, 37},
    {readStage, 20, 21, 117, 118},
    {readStage, 22, 22, 91, 91},
    {initialReadStage, 0, 7, 20, 27},
    {initialReadStage, 8, 8, 19, 19},
    {initialReadStage, 9, 9, 116, 116},
    {initialReadStage, 10, 10, 90, 90},
    {initialReadStage, 11, 11, 120, 120},
    {initialReadStage, 12, 12, 119, 119},
    {nandStageOfLife, 0, 7, 28, 35},
    {dspExceptionParameter, 0, 0, 104, 104},
    {dspExceptionParameter, 1, 7, 38, 44},
    {dspExceptionParameter, 8, 8, 89, 89},
    {dspExceptionParameter, 9, 9, 105, 105},
    {dspExceptionParameter, 10, 11, 114, 115},
    {readStage18NumOfErrorsBin, 0, 11, 45, 56},
    {readStage9NumOfErrorsBin, 0, 7, 57, 64},
    {readStage10NumOfErrorsBin, 0, 9, 67, 76},
    {readStage17NumOfErrorsBin, 0, 9, 77, 86},
    {readStage19NumOfErrorsBin, 0, 11, 92, 103},
    {algoNANDAccessesBin, 0, 7, 106, 113},
});

/// Controllers of the second generation, with any chip.
inline constexpr auto kAlgoGenericK4Map = std::to_array<CounterRange>({
    {readStage, 0, 7, 0, 7},
    {readStage, 9, 18, 9, 18},
    {readStage, 19, 19, 27, 27},
    {readStage, 20, 21, 105, 106},
    {readStage, 22, 22, 79, 79},
    {readStage, 25, 28, 115, 118},
    {readStage, 29, 29, 8, 8},
    {readStage, 30, 31, 120, 121},
    {readStage, 32, 32, 110, 110},
    {initialReadStage, 8, 8, 19, 19},
    {initialReadStage, 9, 9, 104, 104},
    {initialReadStage, 10, 10, 78, 78},
    {initialReadStage, 11, 11, 108, 108},
    {initialReadStage, 12, 12, 107, 107},
    {initialReadStage, 13, 13, 122, 122},
    {nandStageOfLife, 0, 2, 20, 22},
    {nandStageOfLife, 4, 6, 23, 25},
    {dspExceptionParameter, 0, 0, 92, 92},
    {dspExceptionParameter, 1, 2, 28, 29},
    {dspExceptionParameter, 9, 9, 93, 93},
    {dspExceptionParameter, 10, 11, 102, 103},
    {dspExceptionParameter, 13, 15, 30, 32},
    {dspExceptionParameter, 16, 16, 77, 77},
    {dspExceptionParameter, 17, 19, 112, 114},
    {dspExceptionParameter, 20, 20, 126, 126},
    {dspExceptionParameter, 21, 21, 123, 123},
    {dspExceptionParameter, 22, 26, 94, 98},
    {dspExceptionParameter, 28, 30, 99, 101},
    {dspExceptionParameter, 31, 31, 109, 109},
    {dspExceptionParameter, 32, 32, 111, 111},
    {dspExceptionParameter, 33, 36, 45, 48},
    {dspExceptionParameter, 37, 37, 26, 26},
    {readStage18NumOfErrorsBin, 0, 11, 33, 44},
    {readStage10NumOfErrorsBin, 0, 9, 55, 64},
    {readStage17NumOfErrorsBin, 0, 9, 65, 74},
    {readStage19NumOfErrorsBin, 0, 11, 80, 91},
    {retentionIndication, 2, 3, 75, 76},
});

/// Older controllers with chips that have no map below.
inline constexpr auto k1yMap = std::to_array<CounterRange>({
    {readStage, 0, 7, 256, 263},
    {readStage, 8, 8, 265, 265},
    {readStage, 9, 18, 267, 276},
    {readStage, 19, 19, 303, 303},
    {readStage, 20, 21, 390, 391},
    {readStage, 22, 22, 372, 372},
    {initialReadStage, 0, 7, 278, 285},
    {initialReadStage, 8, 8, 277, 277},
    {initialReadStage, 9, 9, 290, 290},
    {initialReadStage, 10, 10, 371, 371},
    {initialReadStage, 11, 11, 393, 393},
    {initialReadStage, 12, 12, 392, 392},
    {nandStageOfLife, 0, 7, 292, 299},
    {dspExceptionParameter, 0, 0, 21, 21},
    {dspExceptionParameter, 1, 2, 305, 306},
    {dspExceptionParameter, 3, 7, 313, 317},
    {dspExceptionParameter, 8, 8, 370, 370},
    {dspExceptionParameter, 9, 9, 15, 15},
    {dspExceptionParameter, 10, 11, 531, 532},
    {readStage18NumOfErrorsBin, 0, 11, 318, 329},
    {readStage9NumOfErrorsBin, 0, 7, 330, 337},
    {readStage10NumOfErrorsBin, 0, 9, 338, 347},
    {readStage17NumOfErrorsBin, 0, 9, 348, 357},
    {readStage19NumOfErrorsBin, 0, 11, 373, 384},
});

/// Older controllers with SanDisk chips.
inline constexpr auto k1xSandiskMap = std::to_array<CounterRange>({
    {readStage, 0, 5, 256, 261},
    {readStage, 8, 8, 265, 265},
    {readStage, 9, 15, 267, 273},
    {readStage, 17, 18, 275, 276},
    {readStage, 19, 19, 301, 301},
    {initialReadStage, 0, 5, 278, 283},
    {initialReadStage, 8, 8, 277, 277},
    {initialReadStage, 9, 9, 288, 288},
    {nandStageOfLife, 0, 7, 290, 297},
    {dspExceptionParameter, 0, 0, 16, 16},
    {dspExceptionParameter, 1, 2, 303, 304},
    {dspExceptionParameter, 3, 7, 311, 315},
    {dspExceptionParameter, 9, 9, 10, 10},
});

/// Older controllers with Hynix chips.
inline constexpr auto k1xHynixMap = std::to_array<CounterRange>({
    {readStage, 0, 3, 256, 259},
    {readStage, 8, 8, 263, 263},
    {readStage, 9, 15, 265, 271},
    {readStage, 17, 18, 273, 274},
    {readStage, 19, 19, 297, 297},
    {initialReadStage, 0, 3, 276, 279},
    {initialReadStage, 8, 8, 275, 275},
    {initialReadStage, 9, 9, 284, 284},
    {nandStageOfLife, 0, 7, 286, 293},
    {dspExceptionParameter, 0, 0, 16, 16},
    {dspExceptionParameter, 1, 2, 299, 300},
    {dspExceptionParameter, 3, 7, 307, 311},
    {dspExceptionParameter, 9, 9, 10, 10},
});

// clang-format on

}  // namespace counter_maps
}  // namespace tavrel
