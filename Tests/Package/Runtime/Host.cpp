int RunPlugin();

int main() { return RunPlugin(); }
