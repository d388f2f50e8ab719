#pragma once

// Runs work in a child process whose files cannot grow beyond a size, the
// way a full disk stops them: with SIGXFSZ ignored, a write past the limit
// fails with EFBIG and the program must notice. The child's report comes back
// through a pipe (pipes have no such limit); the child leaves with _exit, so
// nothing of the parent (temporary folders, the application) is torn down
// twice.
#include <QByteArray>
#include <functional>

#include <csignal>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

struct LimitedRun {
    bool exited = false; // the child ended by itself, not by a signal
    QByteArray report;   // what the child wrote
};

inline LimitedRun runWithFileLimit(rlim_t bytes, const std::function<QByteArray()>& work)
{
    LimitedRun result;
    int fds[2];
    if (pipe(fds) != 0)
        return result;
    const pid_t child = fork();
    if (child == 0) {
        close(fds[0]);
        signal(SIGXFSZ, SIG_IGN);
        const rlimit limit{bytes, bytes};
        setrlimit(RLIMIT_FSIZE, &limit);
        const QByteArray report = work();
        for (qsizetype done = 0; done < report.size();) {
            const ssize_t n = write(fds[1], report.constData() + done, size_t(report.size() - done));
            if (n <= 0)
                break;
            done += n;
        }
        _exit(0);
    }
    close(fds[1]);
    if (child < 0) {
        close(fds[0]);
        return result;
    }
    char buffer[4096];
    for (ssize_t n; (n = read(fds[0], buffer, sizeof buffer)) > 0;)
        result.report.append(buffer, n);
    close(fds[0]);
    int status = 0;
    waitpid(child, &status, 0);
    result.exited = WIFEXITED(status) && WEXITSTATUS(status) == 0;
    return result;
}
