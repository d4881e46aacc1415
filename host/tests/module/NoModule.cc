// A shared library that is no module.

extern "C" int SomethingElse() {
    return 1;
}
