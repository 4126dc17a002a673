// The floor of every process: the cost for the system to start and end one.
int main() {}
