// The floor of every process: what the system needs to start and end one.
int main() {}
