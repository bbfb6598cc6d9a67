import {
  EmptyState,
  EmptyStateBody,
  EmptyStateFooter,
} from '@patternfly/react-core/dist/esm/components/EmptyState';
import { t } from '../texts';
import { PageHeader } from '../ui';

export function NotFound({ home }: { home: string }) {
  return (
    <>
      <PageHeader title={t('app.notFound')} />
      <EmptyState titleText={t('app.notFound')} headingLevel="h2">
        <EmptyStateBody>{t('app.notFound.body')}</EmptyStateBody>
        <EmptyStateFooter>
          <a href={home}>{t('app.home')}</a>
        </EmptyStateFooter>
      </EmptyState>
    </>
  );
}
