import {
  Page,
  PageSection,
  PageSidebar,
  PageSidebarBody,
} from '@patternfly/react-core/dist/esm/components/Page';
import { Nav, NavItem, NavList } from '@patternfly/react-core/dist/esm/components/Nav';
import { SkipToContent } from '@patternfly/react-core/dist/esm/components/SkipToContent';
import { Suspense, useEffect, useState } from 'react';
import { t } from '../texts';
import { ConnectionBanner, Loading } from '../ui';
import { Boundary } from './Boundary';
import { Header } from './Header';
import { NotFound } from './NotFound';
import { hrefOf, kHome, useRoute } from './router';
import { useHostName } from './hostName';
import { viewOf, views } from './views';
import './shell.css';

const kMain = 'main';
// Below this the navigation lies over the content and closes after a choice; the library's own break point.
const kNarrow = '(max-width: 1199px)';
const ignore = () => {};

// The frame around all views: masthead, navigation, and the view that the address names.
export function Shell() {
  const { path } = useRoute();
  const [open, setOpen] = useState(() => !window.matchMedia(kNarrow).matches);
  const view = viewOf(path);
  const host = useHostName();
  const title = t(view?.title ?? 'app.notFound');

  useEffect(() => {
    document.title = host === null ? title : t('app.title', { view: title, host });
  }, [title, host]);
  useEffect(() => {
    const narrow = window.matchMedia(kNarrow);
    const follow = () => setOpen(!narrow.matches);
    narrow.addEventListener('change', follow);
    return () => narrow.removeEventListener('change', follow);
  }, []);

  const sidebar = (
    <PageSidebar isSidebarOpen={open} id="navigation">
      <PageSidebarBody>
        <Nav aria-label={t('app.navigation')}>
          <NavList>
            {views.map((item) => (
              <NavItem
                key={item.path}
                to={hrefOf(item.path)}
                isActive={item === view}
                onClick={() => window.matchMedia(kNarrow).matches && setOpen(false)}
              >
                {t(item.title)}
              </NavItem>
            ))}
          </NavList>
        </Nav>
      </PageSidebarBody>
    </PageSidebar>
  );

  return (
    <Page
      masthead={<Header host={host} open={open} onToggle={() => setOpen(!open)} />}
      sidebar={sidebar}
      skipToContent={
        <SkipToContent
          href={`#${kMain}`}
          onClick={(event) => {
            // The fragment is the address of the view: it must stay.
            event.preventDefault();
            document.getElementById(kMain)?.focus();
          }}
        >
          {t('app.skip')}
        </SkipToContent>
      }
      mainContainerId={kMain}
      mainTabIndex={-1}
      // Without it the library does not find out that the screen is narrow.
      onPageResize={ignore}
    >
      <PageSection isWidthLimited hasBodyWrapper={false} className="vorn-view">
        <ConnectionBanner />
        {/* Not by the address: a dialog's is another one, and the view below it stays. */}
        <Boundary key={view?.path ?? path}>
          <Suspense fallback={<Loading />}>
            {view === undefined ? <NotFound home={hrefOf(kHome)} /> : <view.component key={view.path} />}
          </Suspense>
        </Boundary>
      </PageSection>
    </Page>
  );
}
