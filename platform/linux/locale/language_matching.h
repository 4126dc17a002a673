// Finds the available languages that suit a person's preferences.
#pragma once

#include <string>
#include <vector>

namespace tavrel {

/// The languages of `available`, in their spelling, that suit `preferred`, best first and each
/// once. For each preferred language in turn:
///
/// 1. the same language, script and region;
/// 2. the variety that serves as the region's next best (es-419 for es-MX, en-GB for en-AU);
/// 3. the language without a region;
/// 4. the language as in its home region (pt-BR for pt), then as in any other.
///
/// Equally good languages keep the order of `available`. A language in a script other than the
/// preferred one never suits; a script that is not named is the usual one of the region (zh-TW is
/// zh-Hant-TW). When nothing suits, the result is the first of `available`, the language of
/// untranslated texts. Without preferred languages the result is empty. Both lists are read up to
/// `limits::kLanguages`.
std::vector<std::string> matchLanguages(const std::vector<std::string>& available,
                                        const std::vector<std::string>& preferred);

}  // namespace tavrel
