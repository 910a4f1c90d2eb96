#pragma once

// QDataStream encoding of every record that crosses the wire. Readers never trust the
// data: lists grow one decoded element at a time (no allocation from a claimed count),
// nesting is bounded, and a failed read leaves the stream's status set.

#include "LoadedModuleInfo.h"
#include "ModuleInfo.h"
#include "ProcessInfo.h"
#include "RegistryInfo.h"
#include "VolumeInfo.h"
#include "_DirectoryInfo.h"
#include "_FileInfo.h"
#include "_SettingsInfo.h"

#include "DeviceCache.h"
#include "MifEntry.h"
#include "PriviledgeRecord.h"

#include <QDataStream>
#include <QSharedPointer>

// Settings and directory trees deeper than this are refused as corrupt.
constexpr int MaxRecordNesting = 64;

// The wire form of a list: a quint32 count followed by the elements, which is also the
// form QDataStream uses for its own containers.
template <typename List>
void writeList(QDataStream& out, const List& list)
{
    out << quint32(list.size());
    for (const auto& item : list)
        out << item;
}

template <typename List>
void readList(QDataStream& in, List& list)
{
    list.clear();
    quint32 count = 0;
    in >> count;
    for (quint32 i = 0; i < count && in.status() == QDataStream::Ok; ++i) {
        typename List::value_type item;
        in >> item;
        if (in.status() == QDataStream::Ok)
            list.append(std::move(item));
    }
    if (in.status() != QDataStream::Ok)
        list.clear();
}

QDataStream& operator<<(QDataStream& out, const ModuleInfo& v);
QDataStream& operator>>(QDataStream& in, ModuleInfo& v);
QDataStream& operator<<(QDataStream& out, const RegistryInfo& v);
QDataStream& operator>>(QDataStream& in, RegistryInfo& v);
QDataStream& operator<<(QDataStream& out, const ThreadEntry& v);
QDataStream& operator>>(QDataStream& in, ThreadEntry& v);
QDataStream& operator<<(QDataStream& out, const ProcessInfo& v);
QDataStream& operator>>(QDataStream& in, ProcessInfo& v);
QDataStream& operator<<(QDataStream& out, const LoadedModuleEntry& v);
QDataStream& operator>>(QDataStream& in, LoadedModuleEntry& v);
QDataStream& operator<<(QDataStream& out, const LoadedModuleInfo& v);
QDataStream& operator>>(QDataStream& in, LoadedModuleInfo& v);
QDataStream& operator<<(QDataStream& out, const VolumeInfo& v);
QDataStream& operator>>(QDataStream& in, VolumeInfo& v);
QDataStream& operator<<(QDataStream& out, const _FileInfo& v);
QDataStream& operator>>(QDataStream& in, _FileInfo& v);
QDataStream& operator<<(QDataStream& out, const _DirectoryInfo& v);
QDataStream& operator>>(QDataStream& in, _DirectoryInfo& v);
QDataStream& operator<<(QDataStream& out, const _SettingsInfo& v);
QDataStream& operator>>(QDataStream& in, _SettingsInfo& v);

// Shared records travel as their record; null pointers are written as empty records
// and always read back as a fresh record.
QDataStream& operator<<(QDataStream& out, const QSharedPointer<_FileInfo>& v);
QDataStream& operator>>(QDataStream& in, QSharedPointer<_FileInfo>& v);
QDataStream& operator<<(QDataStream& out, const QSharedPointer<_DirectoryInfo>& v);
QDataStream& operator>>(QDataStream& in, QSharedPointer<_DirectoryInfo>& v);
QDataStream& operator<<(QDataStream& out, const QSharedPointer<_SettingsInfo>& v);
QDataStream& operator>>(QDataStream& in, QSharedPointer<_SettingsInfo>& v);

QDataStream& operator<<(QDataStream& out, const PriviledgeRecord& v);
QDataStream& operator>>(QDataStream& in, PriviledgeRecord& v);
QDataStream& operator<<(QDataStream& out, const MifApplet& v);
QDataStream& operator>>(QDataStream& in, MifApplet& v);
QDataStream& operator<<(QDataStream& out, const MifNotifier& v);
QDataStream& operator>>(QDataStream& in, MifNotifier& v);
QDataStream& operator<<(QDataStream& out, const MifMimeType& v);
QDataStream& operator>>(QDataStream& in, MifMimeType& v);
QDataStream& operator<<(QDataStream& out, const MifEntry& v);
QDataStream& operator>>(QDataStream& in, MifEntry& v);
QDataStream& operator<<(QDataStream& out, const IdRecord& v);
QDataStream& operator>>(QDataStream& in, IdRecord& v);
QDataStream& operator<<(QDataStream& out, const DeviceData& v);
QDataStream& operator>>(QDataStream& in, DeviceData& v);
QDataStream& operator<<(QDataStream& out, const DeviceCache& v);
QDataStream& operator>>(QDataStream& in, DeviceCache& v);
