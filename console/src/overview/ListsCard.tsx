import { Card, CardBody, CardFooter, CardTitle } from '@patternfly/react-core/dist/esm/components/Card';
import type { KnownList, Overview } from '../api/types';
import { hrefOf } from '../shell/router';
import { formatAge, formatExactTime, t } from '../texts';
import { ErrorAlert, Loading, useNow, type Polled } from '../ui';
import { Facts } from './Facts';

interface ListsCardProps {
  overview: Overview | undefined;
  lists: Polled<{ domains: KnownList[] }>;
}

// How many users and groups are known, how old that is, and a refresh that runs.
export function ListsCard({ overview, lists }: ListsCardProps) {
  const now = useNow(10_000);
  const known = lists.data?.domains ?? [];
  const sum = (kind: 'user' | 'group') =>
    known.filter((list) => list.kind === kind).reduce((total, list) => total + list.count, 0);
  const oldest = Math.min(...known.map((list) => list.fetched));
  const domains = new Set(known.map((list) => list.domain)).size;
  const refresh = overview?.refresh ?? null;
  return (
    <Card component="section" aria-labelledby="card-lists">
      <CardTitle component="h2" id="card-lists">
        {t('overview.lists')}
      </CardTitle>
      <CardBody className="vorn-stack">
        {lists.loading && <Loading inline />}
        {lists.error !== undefined && <ErrorAlert error={lists.error} onRetry={lists.reload} />}
        {lists.data !== undefined && known.length === 0 && <p>{t('overview.lists.none')}</p>}
        {known.length > 0 && (
          <Facts
            items={[
              [
                t('overview.lists.count'),
                <>
                  {t('overview.lists.users', { count: sum('user') })},{' '}
                  {t('overview.lists.groups', { count: sum('group') })}{' '}
                  {t('overview.lists.domains', { count: domains })}
                </>,
              ],
              [
                t('overview.lists.age'),
                <time
                  key="age"
                  dateTime={new Date(oldest * 1000).toISOString()}
                  title={formatExactTime(oldest)}
                >
                  {formatAge(oldest, now)}
                </time>,
              ],
            ]}
          />
        )}
        {refresh?.running === true && (
          <div className="vorn-stack">
            <Loading inline patient text={t('overview.lists.running')} />
            <p className="vorn-subtle">
              {t('overview.lists.progress', {
                done: Math.min(refresh.domains_done + 1, refresh.domains),
                all: refresh.domains,
                entries: refresh.count,
              })}
            </p>
          </div>
        )}
        {refresh !== null && !refresh.running && refresh.errors.length > 0 && (
          <p>{t('overview.lists.failed', { count: refresh.errors.length })}</p>
        )}
      </CardBody>
      <CardFooter>
        <a href={hrefOf('/users')}>{t('overview.lists.open')}</a>
      </CardFooter>
    </Card>
  );
}
