// libpulse hands memory from thread to thread through lock-free lists, which ThreadSanitizer cannot see into,
// as the library is not built with it. Named are the functions of libpulse that write such memory, or lock a
// mutex in it; they call nothing of ours.
extern "C" const char* __tsan_default_suppressions();
extern "C" const char* __tsan_default_suppressions() {  // NOLINT(bugprone-reserved-identifier)
    return "race:pa_mutex_lock\n"
           "race:pa_packet_new_data\n"
           "race:pa_tagstruct_put\n"
           "race:pa_iochannel_read_with_ancil_data\n"
           "race:pa_srbchannel_read\n";
}
