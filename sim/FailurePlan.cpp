#include "FailurePlan.h"

bool FailurePlan::parseCode(const QString& text, qint32& code)
{
    bool ok = false;
    const QString t = text.trimmed();
    const quint64 value = t.startsWith(QLatin1String("0x"), Qt::CaseInsensitive) ? t.mid(2).toULongLong(&ok, 16)
                                                                                  : t.toULongLong(&ok, 10);
    if (!ok || value == 0 || value > 0xffffffffu)
        return false;
    code = qint32(quint32(value));
    return true;
}

bool FailurePlan::addRule(const QString& text, const QStringList& knownOperations, QString* error)
{
    const qsizetype equals = text.lastIndexOf(QLatin1Char('='));
    if (equals <= 0) {
        *error = QStringLiteral("--fail %1: expected OP[:PATH]=CODE").arg(text);
        return false;
    }
    Rule rule;
    if (!parseCode(text.mid(equals + 1), rule.code)) {
        *error = QStringLiteral("--fail %1: CODE must be a non-zero 32-bit number (decimal or 0x...)").arg(text);
        return false;
    }
    const QString target = text.left(equals);
    const qsizetype colon = target.indexOf(QLatin1Char(':'));
    rule.operation = colon < 0 ? target : target.left(colon);
    if (colon >= 0) {
        rule.forPath = true;
        rule.path = target.mid(colon + 1);
        if (rule.path.isEmpty()) {
            *error = QStringLiteral("--fail %1: the path after ':' is empty").arg(text);
            return false;
        }
    }
    if (!knownOperations.contains(rule.operation)) {
        *error = QStringLiteral("--fail %1: unknown operation \"%2\" (known: %3)")
                     .arg(text, rule.operation, knownOperations.join(QStringLiteral(", ")));
        return false;
    }
    m_rules.append(rule);
    return true;
}

bool FailurePlan::match(const QString& operation, const QString& path, qint32& code) const
{
    const Rule* general = nullptr;
    for (const Rule& rule : m_rules) {
        if (rule.operation != operation)
            continue;
        if (rule.forPath && rule.path == path) {
            code = rule.code;
            return true;
        }
        if (!rule.forPath && !general)
            general = &rule;
    }
    if (general)
        code = general->code;
    return general != nullptr;
}
