#pragma once

// The private CUPS server the "cups" CTest fixture starts: its queues write
// each job's bytes into a file named like the queue under TAGORA_CUPS_OUT.
// A queue's file holds its last job only, so a test removes it before the
// job (clear) and reads it once the queue is idle again (waitForJob).
#include <QDeadlineTimer>
#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QProcess>
#include <QString>
#include <QThread>

namespace cupsqueue {

inline const char* const kPdfQueue = "tagora-pdf";
inline const char* const kRejectQueue = "tagora-reject";

inline QString outputFolder()
{
    return qEnvironmentVariable("TAGORA_CUPS_OUT");
}

inline QString outputFile(const QString& queue)
{
    return QDir(outputFolder()).filePath(queue);
}

// Empty when the fixture's server answers; otherwise why not (for QSKIP).
inline QString unavailable()
{
    if (qEnvironmentVariableIsEmpty("CUPS_SERVER") || outputFolder().isEmpty())
        return QStringLiteral("the cups fixture is not set up (CUPS_SERVER, TAGORA_CUPS_OUT)");
    QProcess p;
    p.start(QStringLiteral("lpstat"), {QStringLiteral("-r")});
    if (!p.waitForFinished(10000) || !p.readAllStandardOutput().contains("is running"))
        return QStringLiteral("the private CUPS server does not answer at %1").arg(qEnvironmentVariable("CUPS_SERVER"));
    return {};
}

inline void clear(const QString& queue)
{
    QFile::remove(outputFile(queue));
}

// The queue's output once it has no job left pending, or empty text when
// none came within timeoutMs.
inline QString waitForJob(const QString& queue, int timeoutMs = 30000)
{
    QDeadlineTimer deadline(timeoutMs);
    while (!deadline.hasExpired()) {
        QProcess p;
        p.start(QStringLiteral("lpstat"), {QStringLiteral("-o"), queue});
        const bool idle = p.waitForFinished(10000) && p.exitCode() == 0 && p.readAllStandardOutput().trimmed().isEmpty();
        if (idle && QFileInfo::exists(outputFile(queue)))
            return outputFile(queue);
        QThread::msleep(100);
    }
    return {};
}

} // namespace cupsqueue
