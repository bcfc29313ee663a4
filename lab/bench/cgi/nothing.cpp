// Linked with libcurl, libcrypto and jsoncpp: what starting and ending such a program costs.
int main() {}
