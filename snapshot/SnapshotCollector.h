#pragma once

#include "ProgressCallback.h"
#include "_SettingsInfo.h"

#include <QJsonObject>
#include <QString>
#include <QVector>

class _ZantDevice;

// Takes a snapshot of a connected device: a manifest (the device's identity, the time,
// the program's version and the versions of the documents' schemas) and every document
// the pages show, in their JSON form, plus the file listing of every volume with sizes
// and, for files up to a size limit, a SHA-256 of their content. Runs on the calling
// thread; the window runs it on a worker.
class SnapshotCollector
{
public:
    // Everything in the snapshot document, "delvix.snapshot" version 1 (see
    // share/delvix/schema/snapshot.json). hashLimit < 0 hashes nothing. callback (may be
    // null) gets each step's number of Steps and its name; true from it stops with
    // PortlexError::Cancelled. Returns 0, or the failing call's code with *failedStep
    // naming what was being read.
    static int collect(_ZantDevice& device, const QString& deviceId, qint64 hashLimit, QJsonObject* snapshot,
                       QString* failedStep, PortlexProgressCallback callback = nullptr, void* context = nullptr);

    static constexpr int Steps = 8;

    // The settings store depth first from the root, each node before its children, children
    // in device order; a node met twice (a device naming an ancestor as a child) is read
    // once. Returns 0, or the failing call's code with *failed naming the node.
    static int settingsNodes(_ZantDevice& device, QVector<_SettingsInfo>* nodes, QString* failed);
};
