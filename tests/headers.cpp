// The program of this file is nothing; its target holds the precompiled headers of the tests.
int main() {}
