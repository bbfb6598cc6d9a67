import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { Card, CardBody, CardFooter, CardTitle } from '@patternfly/react-core/dist/esm/components/Card';
import { call } from '../api/client';
import type { Overview } from '../api/types';
import { formatAge, formatDuration, formatExactTime, t } from '../texts';
import { ErrorAlert, Loading, useCall, useNow } from '../ui';
import { Facts } from './Facts';
import { Verdict } from './Verdict';

interface TestCardProps {
  overview: Overview | undefined;
  // The overview holds the time of the new test only after this.
  onTested: () => void;
  disabled: boolean;
}

// Whether the membership works: the last test, and a button for a new one.
export function TestCard({ overview, onTested, disabled }: TestCardProps) {
  const test = useCall(async () => {
    const answer = await call('domain.test_dc', {});
    onTested();
    return answer;
  });
  const now = useNow(10_000);
  const last = overview?.last_test ?? null;
  // The answer of this window's own test counts until the overview has been read anew.
  const success = test.data?.test_join_success ?? last?.success ?? null;
  return (
    <Card component="section" aria-labelledby="card-test">
      <CardTitle component="h2" id="card-test">
        {t('overview.test')}
      </CardTitle>
      <CardBody className="vorn-stack">
        <div role="status" className="vorn-stack">
          {!test.busy && success === true && <Verdict kind="good" text={t('overview.test.works')} />}
          {!test.busy && success === false && (
            <>
              <Verdict kind="bad" text={t('overview.test.fails')} />
              <p>{t('overview.test.failsBody')}</p>
              <p>{t('overview.test.failsAction')}</p>
            </>
          )}
          {!test.busy && success === null && (
            <>
              <Verdict kind="unknown" text={t('overview.test.none')} />
              <p className="vorn-subtle">{t('overview.test.noneBody')}</p>
            </>
          )}
        </div>
        {test.busy && <Loading inline text={t('overview.test.running')} />}
        {test.error !== undefined && <ErrorAlert error={test.error} title={t('overview.test.callFailed')} />}
        {last !== null && !test.busy && (
          <Facts
            items={[
              [
                t('overview.test.last'),
                <time
                  key="time"
                  dateTime={new Date(last.time * 1000).toISOString()}
                  title={formatExactTime(last.time)}
                >
                  {formatAge(last.time, now)}
                </time>,
              ],
              [t('overview.test.took'), formatDuration(last.milliseconds)],
            ]}
          />
        )}
      </CardBody>
      <CardFooter>
        <Button variant="secondary" isDisabled={test.busy || disabled} onClick={() => void test.run()}>
          {t('overview.test.run')}
        </Button>
      </CardFooter>
    </Card>
  );
}
