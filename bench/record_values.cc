// Records measurements of many keys in turn through libbrimhold, for the benchmark of folds.
//   tavrel_record_values KEYS VALUES
#include <cstdlib>
#include <string>
#include <vector>

#include "brimhold/client.h"

int main(int count, char** arguments) {
  if (count != 3) return EXIT_FAILURE;
  std::vector<BHClientDistributionKey*> keys;
  for (int i = 0; i < std::atoi(arguments[1]); ++i)
    keys.push_back(
        BHClientDistributionForKey(("com.example.measurement." + std::to_string(i)).c_str()));
  if (keys.empty()) return EXIT_FAILURE;
  for (std::size_t i = 0; i < std::strtoul(arguments[2], nullptr, 10); ++i)
    BHClientDistributionRecord(keys[i * 7919 % keys.size()], static_cast<double>(i));
}
