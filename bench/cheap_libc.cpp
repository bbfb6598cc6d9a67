// What the linker puts in the place of the C library's functions that would leave the process (-Wl,--wrap): nothing is
// run, removed, waited for or logged.

extern "C" {

int __wrap_system(const char* command);
int __wrap_access(const char* path, int mode);
int __wrap_unlink(const char* path);
unsigned __wrap_sleep(unsigned seconds);
void __wrap_syslog(int priority, const char* format, ...);
void __wrap___syslog_chk(int priority, int flag, const char* format, ...);

int __wrap_system(const char* /*command*/) {
    return 0;
}

int __wrap_access(const char* /*path*/, int /*mode*/) {
    return 0;
}

int __wrap_unlink(const char* /*path*/) {
    return 0;
}

unsigned __wrap_sleep(unsigned /*seconds*/) {
    return 0;
}

void __wrap_syslog(int /*priority*/, const char* /*format*/, ...) {}

void __wrap___syslog_chk(int /*priority*/, int /*flag*/, const char* /*format*/, ...) {}

}  // extern "C"
