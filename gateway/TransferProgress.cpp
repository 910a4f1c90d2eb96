#include "TransferProgress.h"

#include <QString>

TransferProgress::TransferProgress(PortlexProgressCallback callback, void* context, quint64 size)
    : m_callback(callback), m_context(context), m_total(kibibytes(size))
{
    if (m_callback)
        m_callback(m_context, -1, m_total, QString());
}

bool TransferProgress::cancelled(quint64 done) const
{
    return m_callback && m_callback(m_context, kibibytes(done), m_total, QString());
}
