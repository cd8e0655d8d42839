#include <gmock/gmock.h>

#include <sstream>
#include <vector>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Exceptions/Trace.h"
#include "Utilities/Tools/LexicalCast.h"
#include "Utilities/Tools/SmartPointer.h"

namespace Varnholt::Utilities::Exceptions {
namespace {

using DeviceDriver::Generic::Utilities::DataException;
using testing::HasSubstr;

template <class Body>
void Traced(Body body) try {
    body();
}
TRACED

template <class Thrown, class Body>
Thrown Catch(Body body) {
    try {
        Traced(body);
    } catch (Thrown& exception) {
        return exception;
    }
    throw std::logic_error("expected another exception");
}

struct Inner {
    static void Fail(int) try {
        throw DataException("bad data", FormatLocation("", "Inner::Fail", "C:\\x\\src\\a\\src\\b.cpp", 292));
    }
    TRACED
    static void Outer() try { Fail(1); }
    TRACED
};

class StreamFailure : public std::runtime_error {
    using std::runtime_error::runtime_error;
};

TEST(Exceptions, QualifiedNamesComeOutOfSignatures) {
    const std::vector<std::pair<const char*, const char*>> cases{
        {"N::A::A(int, const char*)", "N::A::A"},
        {"virtual std::vector<std::pair<int, char> > N::A::f(int (*)(char)) const", "N::A::f"},
        {"const T* N::P<T>::operator->() const [with T = N::A<int>]", "N::P<N::A<int>>::operator ->"},
        {"N::P<T>& N::P<T>::operator=(const N::P<T>&) [with T = int]", "N::P<int>::operator="},
        {"bool N::A::operator()(int) const", "N::A::operator()"},
        {"N::A::operator bool() const", "N::A::operator bool"},
        {"N::P<T>::P() [with T = int]", "N::P<int>::P"},
        {"void N::{anonymous}::f(int)", "N::{anonymous}::f"},
        {"const char *N::A::f()", "N::A::f"},
    };
    for (const auto& [signature, name] : cases) {
        EXPECT_EQ(QualifiedName(signature), name);
    }
}

TEST(Exceptions, TraceGrowsByOneEntryPerOperationLeft) {
    const auto exception = Catch<DataException>([] { Inner::Outer(); });
    const auto& trace = exception.GetTrace();
    ASSERT_EQ(trace.size(), 4U);
    EXPECT_EQ(trace.front(), "::Inner::Fail(): \\src\\b.cpp:292") << "the file from its last source root on";
    EXPECT_THAT(*std::next(trace.begin(), 2), testing::ContainsRegex("^::.*Inner::Outer\\(\\): .*cpp:."));
    EXPECT_STREQ(exception.what(), "bad data");
    SetVerboseText(true);
    EXPECT_THAT(exception.what(), testing::ContainsRegex("^bad data\n\t.*\n\t.*\n\t.*\n\t"));
    SetVerboseText(false);
    EXPECT_EQ(FormatLocation("ctx", "f", "plain.cpp", 7), "ctx::f(): plain.cpp:7");

    const auto null = Catch<NullPointerException>([] { *Tools::SmartPointer<Inner>(); });
    EXPECT_THAT(null.what(), testing::ContainsRegex("^accessed null pointer \\(.*Inner"));
    EXPECT_THAT(null.GetTrace().front(), HasSubstr("(): \\src\\Utilities/Tools/SmartPointer.h:"));
}

template <class Standard, class Expected>
void ExpectTranslation() {
    const auto exception = Catch<Expected>([] { throw Standard("x"); });
    EXPECT_STREQ(exception.what(), "x");
    EXPECT_EQ(exception.GetTrace().size(), 1U);
}

TEST(Exceptions, StandardExceptionsAreTranslatedByExactType) {
    ExpectTranslation<std::runtime_error, RuntimeException>();
    ExpectTranslation<std::overflow_error, OverflowException>();
    ExpectTranslation<std::underflow_error, UnderflowException>();
    ExpectTranslation<std::range_error, RangeException>();
    ExpectTranslation<std::logic_error, LogicException>();
    ExpectTranslation<std::domain_error, DomainException>();
    ExpectTranslation<std::invalid_argument, InvalidArgumentException>();
    ExpectTranslation<std::length_error, LengthException>();
    ExpectTranslation<std::out_of_range, OutOfRangeException>();
    EXPECT_STREQ(Catch<BadAllocException>([] { throw std::bad_alloc(); }).what(), "bad allocation");
    EXPECT_STREQ(Catch<BadCastException>([] { throw std::bad_cast(); }).what(), "bad cast");
    EXPECT_STREQ(Catch<BadTypeidException>([] { throw std::bad_typeid(); }).what(), "bad typeid");
    EXPECT_STREQ(BadAllocException("ignored", "").what(), "bad allocation");
    EXPECT_STREQ(Catch<OutOfRangeException>([] { throw OutOfRangeException("x", ""); }).what(), "x");
    EXPECT_FALSE((std::is_base_of_v<RuntimeException, OutOfRangeException>));

    const auto other = Catch<RuntimeException>([] { throw StreamFailure("y"); });
    EXPECT_EQ(std::string(other.what()), Tools::ReadableName(typeid(StreamFailure)) + " y");
    EXPECT_STREQ(Catch<RuntimeException>([] { throw 7; }).what(), "unkown exception caught");
}

TEST(Exceptions, VerboseTextShowsTheTraceAndASnapshotOfTheCause) {
    RuntimeException exception("message", "A");
    exception.AddLocation("");
    exception.AddLocation("B");
    const std::pair<Cause, std::string> cases[] = {
        {Cause(static_cast<const std::runtime_error&>(exception)),
         "\ncaused by: " + Tools::ReadableName(typeid(RuntimeException)) + ": message\n\tA\n\tB\n"},
        {Cause(StreamFailure("message")),
         "\ncaused by: " + Tools::ReadableName(typeid(StreamFailure)) + ": message\n"},
        {Cause(), ""},
    };
    for (const auto& [cause, expected] : cases) {
        std::ostringstream text;
        cause.Print(text);
        EXPECT_EQ(text.str(), expected);
        EXPECT_STREQ(cause.what(), expected.empty() ? "" : "message");
        const BadAllocException recorded("", "B", cause);
        EXPECT_EQ(recorded.GetCause().IsEmpty(), expected.empty());
        EXPECT_STREQ(recorded.what(), "bad allocation");
        SetVerboseText(true);
        EXPECT_EQ(recorded.what(), "bad allocation\n\tB" + expected);
        SetVerboseText(false);
    }
}

TEST(LexicalCast, RefusesWhatDoesNotBeginWithTheTarget) {
    EXPECT_EQ(Tools::lexical_cast<std::string>(42U), "42");
    EXPECT_EQ(Tools::lexical_cast<int>("17 mm"), 17);
    const auto refused =
        Catch<InvalidArgumentException>([] { Tools::lexical_cast<int>(std::string("x17")); });
    EXPECT_THAT(refused.what(),
                testing::ContainsRegex("^lexical_cast\\(\\): fail to convert 'x17' from .* to int"));
}

}  // namespace
}  // namespace Varnholt::Utilities::Exceptions
