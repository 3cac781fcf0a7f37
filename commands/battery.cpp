#include "commands/battery.h"

std::atomic<pthread_t> adc_test_thread{NO_THREAD};
std::atomic<bool> eadc_test_exit{false};
