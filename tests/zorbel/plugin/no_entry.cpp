// A plug-in without the registration entry point.
extern "C" int SomethingElse() {
    return 1;
}
