#pragma once

#include "DeviceState.h"
#include "SampleBuilder.h"
#include "SimRequestHandler.h"

#include <QByteArray>
#include <QString>
#include <QTemporaryDir>

#include <memory>

// A small device image in a temporary folder, for tests that need exact, known contents:
// a flash volume "/" (module folders sys/mod and usermod) and a card volume "/card".
class TestImage
{
public:
    TestImage();

    QString path() const { return m_dir.path(); }
    // The folder beside the image; tests put their canaries here.
    QString outside() const { return m_outside.path(); }

    static QByteArray defaultProfile();
    void writeProfile(const QByteArray& deviceXml) { writeFile(QStringLiteral("device.xml"), deviceXml); }
    void writeFile(const QString& relativePath, const QByteArray& bytes);
    void addModule(const QString& relativeFolder, const SampleBuilder::ModuleSpec& module);
    // The default contents: profile, a system and a user module, a few files.
    void fillDefault();

    static SampleBuilder::ModuleSpec module(const QString& name, const QVector<quint32>& classes,
                                            const QVector<MifMimeType>& mimeTypes = {});

    // Loads the image as the simulator serves it, with the name databases beside the test;
    // false, with a warning saying why, when the device refuses it.
    bool load();
    DeviceState& state() { return *m_state; }
    SimRequestHandler& handler() { return *m_handler; }

private:
    QTemporaryDir m_dir;
    QTemporaryDir m_outside;
    std::unique_ptr<DeviceState> m_state;
    std::unique_ptr<SimRequestHandler> m_handler;
};
