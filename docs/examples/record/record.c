#include <brimhold/client.h>

int main(void) {
  BHClientScalarAdd(BHClientScalarForKey("com.example.starts"), 1);
  BHClientDistributionRecord(BHClientDistributionForKey("com.example.seconds"), 2.5);
}
