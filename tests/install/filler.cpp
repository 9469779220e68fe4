// A library that takes static thread-local room from the process, a little more than libkfs and its services need.
static thread_local char room[160] __attribute__((tls_model("initial-exec")));

extern "C" __attribute__((visibility("default"))) char* FillerRoom()
{
    return room;
}
