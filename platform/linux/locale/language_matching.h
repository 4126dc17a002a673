// Which of the languages on offer suit a person's preferences.
#pragma once

#include <string>
#include <vector>

namespace tavrel {

/// Those of `available`, spelt as there, that suit `preferred`, best first and each once. For each
/// preferred language in its order:
///
/// 1. the same language, script and region;
/// 2. the variety that serves as the region's next best (es-419 for es-MX, en-GB for en-AU);
/// 3. the language without a region;
/// 4. the language as in its home region (pt-BR for pt), then as in any other.
///
/// Equal ones keep the order of `available`. A language in another script than the preferred one
/// never suits; a script that is not named is the one usual in the region (zh-TW is zh-Hant-TW).
/// When nothing suits, the first of `available` is the answer: it is the language in which texts
/// that are not translated appear. Nothing is answered when nothing is preferred. Both lists are
/// read up to `limits::kLanguages`.
std::vector<std::string> matchLanguages(const std::vector<std::string>& available,
                                        const std::vector<std::string>& preferred);

}  // namespace tavrel
