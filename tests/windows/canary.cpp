// Says with its exit code that it ran, before anything else is believed: where the DLLs of its width are
// missing, a program seems to succeed without having been started.
int main() { return 5; }
