/* Records for the whole of a simulated life. Each line of standard input is a command:
 *   a KEY N   adds to a scalar        s KEY N   sets it
 *   r KEY X   records a value         .         answers with a line
 */
#include <brimhold/client.h>
#include <stdio.h>
#include <stdlib.h>

int main(void) {
  char line[256], kind, key[200];
  double value;
  while (fgets(line, sizeof line, stdin)) {
    if (line[0] == '.') {
      puts(".");
      fflush(stdout);
    } else if (sscanf(line, "%c %199s %lf", &kind, key, &value) != 3) {
      return 2;
    } else if (kind == 'a') {
      BHClientScalarAdd(BHClientScalarForKey(key), (long long)value);
    } else if (kind == 's') {
      BHClientScalarSet(BHClientScalarForKey(key), (long long)value);
    } else {
      BHClientDistributionRecord(BHClientDistributionForKey(key), value);
    }
  }
  return 0;
}
