// A class whose objects tell observers what happens to them.
#pragma once

#include <cstddef>
#include <vector>

template <typename Subject, typename Notification, typename Item>
class Observer {
public:
    virtual ~Observer() = default;
    // The item lives for the length of the call. The subject must not be changed from in here.
    virtual void OnNotify(Subject* observable, Notification notification, const Item* item) = 0;
};

// Threads: none of its own; attaching and notifying come under whatever guards the subject.
template <typename Subject, typename Notification, typename Item>
class Observable {
public:
    using ObserverType = Observer<Subject, Notification, Item>;

    Observable() = default;
    virtual ~Observable() = default;
    Observable(const Observable&) = delete;
    Observable& operator=(const Observable&) = delete;

    // The observer is not owned and must outlive the subject.
    void Attach(ObserverType* observer) { m_observers.push_back(observer); }

protected:
    // False in the usual case: then what would be told need not be put together.
    [[nodiscard]] bool HasObservers() const { return !m_observers.empty(); }
    void Notify(Notification notification, const Item& item) {
        // By index, with the end read anew each time: an observer may attach another one.
        for (size_t i = 0; i < m_observers.size(); ++i) {
            m_observers[i]->OnNotify(static_cast<Subject*>(this), notification, &item);
        }
    }

private:
    std::vector<ObserverType*> m_observers;
};
