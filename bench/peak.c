// usage: peak COMMAND [ARGUMENT...]
//
// Runs a command and prints the largest resident set that one of its processes had, in KiB, as
// /proc has it when the process ends. getrusage(2) is too coarse for small programs: it includes
// what the process had before its exec, and may be tens of pages off.

#include <signal.h>
#include <stdio.h>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

static long peak_of(pid_t process) {
  char line[256];
  long peak = 0;
  snprintf(line, sizeof line, "/proc/%d/status", (int)process);
  FILE* const status = fopen(line, "r");
  while (fgets(line, sizeof line, status) != NULL) sscanf(line, "VmHWM: %ld", &peak);
  fclose(status);
  return peak;
}

int main(int count, char** arguments) {
  const pid_t command = fork();
  if (command == 0) {
    ptrace(PTRACE_TRACEME, 0, NULL, NULL);
    raise(SIGSTOP);
    return execvp(arguments[count > 1], arguments + 1);
  }
  int status = 0;
  waitpid(command, &status, 0);
  ptrace(PTRACE_SETOPTIONS, command, NULL,
         PTRACE_O_TRACEEXIT | PTRACE_O_TRACEFORK | PTRACE_O_TRACEVFORK);
  ptrace(PTRACE_CONT, command, NULL, NULL);
  long peak = 0;
  for (pid_t process; (process = waitpid(-1, &status, __WALL)) > 0;) {
    if (!WIFSTOPPED(status)) continue;
    if (status >> 16 == PTRACE_EVENT_EXIT && peak_of(process) > peak) peak = peak_of(process);
    const long number = WSTOPSIG(status);
    ptrace(PTRACE_CONT, process, NULL, number == SIGTRAP || number == SIGSTOP ? 0 : number);
  }
  printf("%ld\n", peak);
  return 0;
}
