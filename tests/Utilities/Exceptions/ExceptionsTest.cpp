#include <gmock/gmock.h>
#include <gtest/gtest.h>

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
using testing::StartsWith;

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

class Inner {
  public:
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

TEST(Exceptions, LocationKeepsTheFileFromTheLastSourceRoot) {
    EXPECT_EQ(FormatLocation("", "A::f", "C:\\src\\old\\src\\B/c.cpp", 7), "::A::f(): \\src\\B/c.cpp:7");
    EXPECT_EQ(FormatLocation("ctx", "f", "plain.cpp", 7), "ctx::f(): plain.cpp:7");
}

TEST(Exceptions, QualifiedNamesComeOutOfSignatures) {
    const std::vector<std::pair<const char*, const char*>> cases{
        {"N::A::A(int, const char*)", "N::A::A"},
        {"virtual std::vector<std::pair<int, char> > N::A::f(int (*)(char)) const", "N::A::f"},
        {"const T* N::P<T>::operator->() const [with T = N::A<int>]", "N::P<N::A<int>>::operator ->"},
        {"N::P<T>& N::P<T>::operator=(const N::P<T>&) [with T = int]", "N::P<int>::operator="},
        {"bool N::A::operator()(int) const", "N::A::operator()"},
        {"N::P<T>::P() [with T = int]", "N::P<int>::P"},
        {"void N::{anonymous}::f(int)", "N::{anonymous}::f"},
    };
    for (const auto& [signature, name] : cases) {
        EXPECT_EQ(QualifiedName(signature), name);
    }
}

TEST(Exceptions, TraceGrowsByOneEntryPerOperationLeft) {
    try {
        Inner::Outer();
        FAIL();
    } catch (const DataException& exception) {
        ASSERT_EQ(exception.GetTrace().size(), 3U);
        for (const std::string& entry : exception.GetTrace()) {
            EXPECT_THAT(entry, StartsWith("::"));
        }
        EXPECT_EQ(exception.GetTrace().front(), "::Inner::Fail(): \\src\\b.cpp:292");
        EXPECT_THAT(exception.GetTrace().back(), HasSubstr("Inner::Outer(): "));
        EXPECT_STREQ(exception.what(), "bad data");
    }
}

TEST(Exceptions, LibrarySourcesAreNamedFromTheSourceRoot) {
    try {
        *Tools::SmartPointer<Inner>();
        FAIL();
    } catch (const NullPointerException& exception) {
        EXPECT_THAT(exception.what(), StartsWith("accessed null pointer ("));
        EXPECT_THAT(exception.what(), HasSubstr("Inner"));
        ASSERT_EQ(exception.GetTrace().size(), 2U);
        EXPECT_THAT(exception.GetTrace().front(), HasSubstr("(): \\src\\Utilities/Tools/SmartPointer.h:"));
    }
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

TEST(Exceptions, VerboseTextShowsTheTrace) {
    RuntimeException exception("message", "A");
    exception.AddLocation("");
    exception.AddLocation("B");
    const RuntimeException silent("alone", "");
    SetVerboseText(true);
    EXPECT_STREQ(exception.what(), "message\n\tA\n\tB");
    EXPECT_STREQ(static_cast<const std::runtime_error&>(exception).what(), "message\n\tA\n\tB");
    EXPECT_STREQ(silent.what(), "alone");
    SetVerboseText(false);
    EXPECT_STREQ(exception.what(), "message");
}

TEST(Exceptions, CauseIsASnapshot) {
    RuntimeException exception("message", "A");
    exception.AddLocation("");
    const std::pair<Cause, std::string> cases[] = {
        {Cause(static_cast<const std::runtime_error&>(exception)),
         "\ncaused by: " + Tools::ReadableName(typeid(RuntimeException)) + ": message\n\tA\n"},
        {Cause(StreamFailure("message")),
         "\ncaused by: " + Tools::ReadableName(typeid(StreamFailure)) + ": message\n"},
        {Cause(), ""},
    };
    for (const auto& [cause, expected] : cases) {
        std::ostringstream text;
        cause.Print(text);
        EXPECT_EQ(text.str(), expected);
        EXPECT_STREQ(cause.what(), expected.empty() ? "" : "message");
        EXPECT_EQ(cause.IsEmpty(), expected.empty());

        const BadAllocException recorded("", "B", cause);
        EXPECT_EQ(recorded.GetCause().IsEmpty(), expected.empty());
        SetVerboseText(true);
        EXPECT_EQ(recorded.what(), "bad allocation\n\tB" + expected);
        SetVerboseText(false);
    }
}

TEST(SmartPointer, SharesAndReleases) {
    struct Counted {
        explicit Counted(int& counter) : alive(counter) { ++alive; }
        ~Counted() { --alive; }
        int& alive;
    };
    int alive = 0;
    {
        Tools::SmartPointer<Counted> first(new Counted(alive));
        Tools::SmartPointer<Counted> second(first);
        second = *&second;
        first = Tools::SmartPointer<Counted>();
        EXPECT_TRUE(first.IsEmpty());
        EXPECT_EQ(alive, 1);
        EXPECT_EQ(&second->alive, &alive);
    }
    EXPECT_EQ(alive, 0);
}

TEST(LexicalCast, RefusesWhatDoesNotBeginWithTheTarget) {
    EXPECT_EQ(Tools::lexical_cast<std::string>(42U), "42");
    EXPECT_EQ(Tools::lexical_cast<int>("17 mm"), 17);
    try {
        Tools::lexical_cast<int>(std::string("x17"));
        FAIL();
    } catch (const std::invalid_argument& exception) {
        EXPECT_THAT(exception.what(), StartsWith("lexical_cast(): fail to convert 'x17' from "));
        EXPECT_THAT(exception.what(), HasSubstr(" to int"));
    }
}

}  // namespace
}  // namespace Varnholt::Utilities::Exceptions
