#include <gtest/gtest.h>

#include <memory>

#include "core/ObjectFactory.h"

namespace {

struct Widget {
    std::string param;
    static int calls;
    static Widget* create(const std::string& text) {
        ++calls;
        if (text == "{\"fail\":1}") return nullptr;
        Widget* w = new Widget;
        w->param = text;
        return w;
    }
};
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

std::unique_ptr<Widget> make(const std::string& description) {
    return std::unique_ptr<Widget>(WidgetFactory::instance().createInstance(description));
}

}  // namespace

TEST(ObjectFactory, HandsTheCreatorTheRawParamTextOrAnEmptyOne) {
    auto w = make("{  \"name\" : \"PLAIN_WIDGET\",   \"param\" : { \"k\" : [1, 2] }}");
    ASSERT_TRUE(w);
    EXPECT_EQ(w->param, "{ \"k\" : [1, 2] }");
    w = make("{\"name\":\"PLAIN_WIDGET\"}");
    ASSERT_TRUE(w);
    EXPECT_EQ(w->param, "");
    EXPECT_FALSE(make("{\"name\":\"PLAIN_WIDGET\",\"param\":{\"fail\":1}}"));
}

TEST(ObjectFactory, UnknownOrMissingNameIsNullWithoutCallingACreator) {
    const int before = Widget::calls;
    for (const char* text : {"{\"name\":\"OTHER\",\"param\":{}}", "{\"name\":\"plain_widget\"}", "{\"param\":{}}", "{}"})
        EXPECT_FALSE(make(text)) << text;
    EXPECT_EQ(Widget::calls, before);
}

TEST(ObjectFactory, MalformedDescriptionRaisesTheReadersError) {
    for (const char* text : {"", " {\"name\":\"PLAIN_WIDGET\"}", "{\"name\":PLAIN_WIDGET}"})
        EXPECT_THROW(make(text), JsonError) << text;
}
