#include <brimhold/client.hpp>

int main() {
  brimhold::Scalar("com.example.starts").add();
  brimhold::Distribution("com.example.seconds").record(2.5);
}
