// Tries acts that a process of the unit must not be able to do, and writes a line on each: "works" or "fails", and the
// act. Undoes what works. "fails" may also mean that this machine has no such thing: run without the unit's settings,
// the program shows which acts work here at all.
#define _GNU_SOURCE
#include <fcntl.h>
#include <sched.h>
#include <signal.h>
#include <stdbool.h>
#include <stdio.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/sysmacros.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>

#define LENGTH(array) (sizeof(array) / sizeof *(array))

static const char work[] = "/var/db/timezone/work";  // a file that only this program knows
static const char program[] = "/usr/local/sbin/forbidden-acts";
static const char other_user[] = "/usr/local/sbin/set-user-ID";  // this program, with that bit and another owner

static bool report(const char *act, const char *object, bool works) {
  dprintf(STDERR_FILENO, "%s: %s%s\n", works ? "works" : "fails", act, object);
  return works;
}

static bool opens(const char *path, int flags, mode_t mode) {
  const int file = open(path, flags | O_NONBLOCK | O_CLOEXEC, mode);
  return file >= 0 && close(file) == 0;
}

static bool ends(pid_t child) {
  if (child == 0) _exit(0);
  return child > 0 && waitpid(child, NULL, 0) == child;
}

static void use_files(void) {
  static const char *const directories[] = {
      "",     "/etc",     "/usr",     "/root",           "/home", "/run", "/run/systemd/system",
      "/tmp", "/dev/shm", "/var/lib", "/run/tzreconcile"};
  for (size_t i = 0; i < LENGTH(directories); ++i) {
    char path[64];
    snprintf(path, sizeof path, "%s/new", directories[i]);
    if (report("create ", path, opens(path, O_CREAT | O_EXCL | O_WRONLY, 0600))) unlink(path);
  }
  static const char *const devices[] = {"/disk",
                                        "/dev/console",
                                        "/run/initctl",
                                        "/proc/sysrq-trigger",
                                        "/proc/sys/kernel/core_pattern",
                                        "/sys/module/kernel/parameters/panic"};
  for (size_t i = 0; i < LENGTH(devices); ++i) report("write to ", devices[i], opens(devices[i], O_WRONLY, 0));
  report("read ", "/etc/shadow", opens("/etc/shadow", O_RDONLY, 0));
}

static void leave_traps(void) {
  struct stat status;
  report("create a set-user-ID file", "",
         opens(work, O_CREAT | O_WRONLY, 04700) && stat(work, &status) == 0 && (status.st_mode & S_ISUID));
  unlink(work);
  static const char capabilities[20] = {1, 0, 0, 2, 1};
  report("give a file capabilities", "",
         opens(work, O_CREAT | O_WRONLY, 0600) && setxattr(work, "security.capability", capabilities, 20, 0) == 0);
  unlink(work);
  report("create the node of a disk", "", mknod(work, S_IFBLK | 0600, makedev(7, 0)) == 0);
  unlink(work);
}

static void use_kernel(void) {
  report("create an Internet socket", "", close(socket(AF_INET, SOCK_DGRAM, 0)) == 0);
  report("create a local socket", "", close(socket(AF_UNIX, SOCK_STREAM, 0)) == 0);
  mkdir(work, 0700);
  report("mount a file system", "", mount("tmpfs", work, "tmpfs", 0, NULL) == 0 && umount(work) == 0);
  rmdir(work);
  report("create a process", "", ends(fork()));
  report("create a user namespace", "", ends((pid_t)syscall(SYS_clone, CLONE_NEWUSER | SIGCHLD, 0, 0, 0, 0)));
  report("signal process 1", "", kill(1, 0) == 0);
  struct rlimit limit;
  report("change the limits of process 1", "",
         prlimit(1, RLIMIT_CORE, NULL, &limit) == 0 && prlimit(1, RLIMIT_CORE, &limit, NULL) == 0);
  report("map writable and executable memory", "",
         mmap(NULL, 1, PROT_READ | PROT_WRITE | PROT_EXEC, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0) != MAP_FAILED);
}

// The acts that replace the program, each followed by the next one, whether it works or not.
static void run_what_was_written(void) {
  const int from = open(program, O_RDONLY | O_CLOEXEC), to = open(work, O_CREAT | O_WRONLY | O_CLOEXEC, 0700);
  char buffer[4096];
  for (ssize_t size; (size = read(from, buffer, sizeof buffer)) > 0;)
    if (write(to, buffer, (size_t)size) != size) break;
  close(to);
  execl(work, "written", NULL);
  report("run a program that it wrote", "", false);
}

static void become_another_user(void) {
  unlink(work);
  execl(other_user, "other user", NULL);
  report("become another user", "", false);
}

// The last act, since it may end the program.
static void call_as_32_bit_program(void) {
#ifdef __x86_64__
  long process = -1;
  __asm__ volatile("int $0x80" : "=a"(process) : "a"(20L) : "memory", "r8", "r9", "r10", "r11");
  report("call the kernel as a 32-bit program", "", process > 0);
#endif
}

int main(int count, char **names) {
  switch (count > 0 ? names[0][0] : 0) {
    default:
      use_files();
      leave_traps();
      use_kernel();
      run_what_was_written();
      become_another_user();
      break;
    case 'w':
      report("run a program that it wrote", "", true);
      become_another_user();
      break;
    case 'o':
      report("become another user", "", geteuid() != getuid());
  }
  call_as_32_bit_program();
}
