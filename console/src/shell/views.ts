import { createElement, type ComponentType, type LazyExoticComponent } from 'react';
import type { PlainKey } from '../texts';
import { viewFile } from './viewFile';

export interface View {
  path: string;
  title: PlainKey;
  component: LazyExoticComponent<ComponentType>;
}

const directory = (kind: 'user' | 'group') =>
  viewFile(async () => {
    const { default: DirectoryPage } = await import('../directory/DirectoryPage');
    return { default: () => createElement(DirectoryPage, { kind }) };
  });

// The overview with a dialog open.
const kOverviewPaths = ['/', '/join', '/leave'];

// The views in the order of the navigation.
export const views: View[] = [
  { path: '/overview', title: 'nav.overview', component: viewFile(() => import('../overview/OverviewPage')) },
  { path: '/domains', title: 'nav.domains', component: viewFile(() => import('../domains/DomainsPage')) },
  { path: '/users', title: 'nav.users', component: directory('user') },
  { path: '/groups', title: 'nav.groups', component: directory('group') },
  { path: '/options', title: 'nav.options', component: viewFile(() => import('../options/OptionsPage')) },
  { path: '/schedule', title: 'nav.schedule', component: viewFile(() => import('../schedule/SchedulePage')) },
  { path: '/events', title: 'nav.events', component: viewFile(() => import('../events/EventsPage')) },
];

export function viewOf(path: string): View | undefined {
  return views.find((view) => view.path === path) ?? (kOverviewPaths.includes(path) ? views[0] : undefined);
}
