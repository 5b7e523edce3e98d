#include <gtest/gtest.h>

#include <memory>

#include "core/ObjectFactory.h"

namespace {

struct Widget {
    std::string param;
    static std::string lastParam;
    static int calls;
    static Widget* create(const std::string& text) {
        ++calls;
        lastParam = text;
        if (text == "{\"fail\":1}") return nullptr;
        Widget* w = new Widget;
        w->param = text;
        return w;
    }
};
std::string Widget::lastParam;
int Widget::calls = 0;

class WidgetFactory : public ObjectFactory<Widget> {
public:
    static WidgetFactory& instance() {
        static WidgetFactory factory;
        return factory;
    }

private:
    WidgetFactory() { creators["PLAIN_WIDGET"] = &Widget::create; }
};

}  // namespace

TEST(ObjectFactory, CreatesByNameWithTheRawParamText) {
    std::unique_ptr<Widget> w(
        WidgetFactory::instance().createInstance("{  \"name\" : \"PLAIN_WIDGET\",   \"param\" : { \"k\" : [1, 2] }}"));
    ASSERT_TRUE(w);
    EXPECT_EQ(w->param, "{ \"k\" : [1, 2] }");
}

TEST(ObjectFactory, MissingParamGivesTheCreatorAnEmptyText) {
    Widget::lastParam = "unset";
    std::unique_ptr<Widget> w(WidgetFactory::instance().createInstance("{\"name\":\"PLAIN_WIDGET\"}"));
    ASSERT_TRUE(w);
    EXPECT_EQ(Widget::lastParam, "");
}

TEST(ObjectFactory, UnknownOrMissingNameGivesNullWithoutCallingACreator) {
    const int before = Widget::calls;
    EXPECT_EQ(WidgetFactory::instance().createInstance("{\"name\":\"OTHER\",\"param\":{}}"), nullptr);
    EXPECT_EQ(WidgetFactory::instance().createInstance("{\"name\":\"plain_widget\"}"), nullptr);
    EXPECT_EQ(WidgetFactory::instance().createInstance("{\"param\":{}}"), nullptr);
    EXPECT_EQ(WidgetFactory::instance().createInstance("{}"), nullptr);
    EXPECT_EQ(Widget::calls, before);
}

TEST(ObjectFactory, CreatorFailureIsNull) {
    EXPECT_EQ(WidgetFactory::instance().createInstance("{\"name\":\"PLAIN_WIDGET\",\"param\":{\"fail\":1}}"), nullptr);
}

TEST(ObjectFactory, MalformedDescriptionRaisesTheReadersError) {
    EXPECT_THROW(WidgetFactory::instance().createInstance(""), JsonError);
    EXPECT_THROW(WidgetFactory::instance().createInstance(" {\"name\":\"PLAIN_WIDGET\"}"), JsonError);
    // A bare name is not a string.
    EXPECT_THROW(WidgetFactory::instance().createInstance("{\"name\":PLAIN_WIDGET}"), JsonError);
}
