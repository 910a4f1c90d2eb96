#pragma once

#include <QList>
#include <QString>
#include <QStringList>

// The --fail rules: "OP=CODE" makes every request of operation OP answer CODE;
// "OP:PATH=CODE" only those that name exactly PATH. A rule for the path wins over a rule
// for the whole operation.
class FailurePlan
{
public:
    // knownOperations: the names OP may take. False, with error set, for a malformed rule.
    bool addRule(const QString& text, const QStringList& knownOperations, QString* error);

    // The code to answer instead of serving the request, if a rule applies.
    bool match(const QString& operation, const QString& path, qint32& code) const;

    bool isEmpty() const { return m_rules.isEmpty(); }

    // Decimal, or hexadecimal after "0x"; any 32-bit value except 0.
    static bool parseCode(const QString& text, qint32& code);

private:
    struct Rule
    {
        QString operation;
        QString path;
        bool forPath = false;
        qint32 code = 0;
    };
    QList<Rule> m_rules;
};
