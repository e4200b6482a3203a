/*
 * Exits 0 when a signal handler leaves the interrupted thread's own thread
 * pointer in place, 1 when the thread comes back with another thread's.
 * A kernel keeps each thread's TLS descriptor; qemu-i386 (7.2) keeps one
 * descriptor for all threads and reloads %gs from it on sigreturn, so a
 * signalled thread returns wearing the most recently created thread's TCB.
 */
#include <pthread.h>
#include <signal.h>
#include <stdint.h>
#include <stdio.h>
#include <unistd.h>

static void onSignal(int sig) { (void)sig; }

static uintptr_t threadPointer(void) {
    uintptr_t p;
#if defined(__i386__)
    __asm__ volatile("movl %%gs:0, %0" : "=r"(p));
#else
    p = (uintptr_t)pthread_self();
#endif
    return p;
}

static volatile sig_atomic_t ready;
static volatile int kept = -1;

static void* signalled(void* arg) {
    (void)arg;
    const uintptr_t before = threadPointer();
    ready = 1;
    pause();
    kept = threadPointer() == before;
    return NULL;
}

static void* later(void* arg) { return arg; }

int main(void) {
    struct sigaction action = {0};
    action.sa_handler = onSignal;
    sigemptyset(&action.sa_mask);
    sigaction(SIGUSR1, &action, NULL);

    pthread_t first, second;
    pthread_create(&first, NULL, signalled, NULL);
    pthread_create(&second, NULL, later, NULL);  /* the most recent thread */
    pthread_join(second, NULL);
    while (!ready) usleep(1000);
    usleep(50000);  /* into pause() */
    pthread_kill(first, SIGUSR1);
    pthread_join(first, NULL);
    printf("a signal handler %s the thread's own thread pointer\n", kept ? "keeps" : "replaces");
    return kept ? 0 : 1;
}
